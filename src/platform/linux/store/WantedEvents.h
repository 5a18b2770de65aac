#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/SettingsStore.h"

namespace tal {

/// Which event names are wanted: the setting `wanted` of
/// "org.vantle.talsys.analytics", a list of globs (*, ?, [a-z]). Absent: all;
/// empty: none; anything else is logged once and counts as absent.
///
/// A name costs one hash look-up once it is known. Lives on one queue.
class WantedEvents {
 public:
  struct Dependencies {
    const SettingsStore& settings;
    const LogChannel& log;
    /// Read at each question, to look at the setting again now and then.
    std::function<Clock::Instant()> coarse_now;
  };

  /// What is referred to outlives the object.
  explicit WantedEvents(Dependencies dependencies) : dependencies_(std::move(dependencies)) {}

  bool contains(std::string_view name);

 private:
  struct Hash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const { return std::hash<std::string_view>()(text); }
  };

  void lookAtSetting();
  bool matches(const std::string& name) const;

  Dependencies dependencies_;
  std::optional<Clock::Instant> looked_at_;
  std::optional<MessageValue> setting_;
  std::optional<std::vector<std::string>> globs_;  // none: everything is wanted
  std::unordered_map<std::string, bool, Hash, std::equal_to<>> answers_;
};

}  // namespace tal
