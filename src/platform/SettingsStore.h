#pragma once

#include <optional>
#include <string_view>

#include "core/MessageValue.h"

namespace tal {

/// Settings by domain and key. Any thread. A look-up may read a file that has
/// changed, so it is not for the road of every message.
class SettingsStore {
 public:
  virtual ~SettingsStore() = default;

  /// The value or nothing: what the service wrote itself first, else what the
  /// administrator wrote.
  virtual std::optional<MessageValue> value(std::string_view domain, std::string_view key) const = 0;

  /// The next look-up in the domain sees what is written by now: for someone who
  /// was just told of a change, where an ordinary look-up may be a moment old.
  virtual void refresh(std::string_view domain) = 0;

  /// Keeps a value of the service's own across restarts. False when it could
  /// not be written; the reason is logged.
  virtual bool setValue(std::string_view domain, std::string_view key, const MessageValue& value) = 0;
};

}  // namespace tal
