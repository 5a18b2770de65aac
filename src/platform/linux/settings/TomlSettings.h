#pragma once

#include <filesystem>
#include <map>
#include <mutex>
#include <string>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/SettingsStore.h"
#include "platform/linux/settings/TomlFile.h"

namespace tal {

/// Settings as TOML files: the domain `d` is `settings/d.toml` in two
/// directories, of which the service's own (state) is looked into first and
/// alone is written. Any thread.
///
/// A changed file is seen at a look-up at most half a second later, or at once
/// after `refresh`; between look-ups nothing is done, so that an idle daemon does not wake up. A file
/// that does not read counts as empty, and is never written over.
class TomlSettings final : public SettingsStore {
 public:
  struct Dependencies {
    std::filesystem::path config_directory;  ///< The administrator's; need not exist.
    std::filesystem::path
        state_directory;  ///< The service's own; `settings` in it is made when first written.
    const Clock& clock;
    const LogChannel& log;
  };

  /// What the dependencies refer to outlives the object. Reads nothing yet.
  explicit TomlSettings(Dependencies dependencies) : dependencies_(std::move(dependencies)) {}

  std::optional<MessageValue> value(std::string_view domain, std::string_view key) const override;
  void refresh(std::string_view domain) override;
  bool setValue(std::string_view domain, std::string_view key, const MessageValue& value) override;

 private:
  struct Domain {
    TomlFile state;
    TomlFile config;
    std::optional<Clock::Instant> looked_at;
  };

  Domain& domainNamed(std::string_view name) const;
  bool write(TomlFile& file, std::string_view key, const MessageValue& value);

  Dependencies dependencies_;
  mutable std::mutex mutex_;
  mutable std::map<std::string, Domain, std::less<>> domains_;
};

}  // namespace tal
