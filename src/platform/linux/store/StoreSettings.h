#pragma once

#include <string>

#include "core/Log.h"
#include "platform/SettingsStore.h"
#include "platform/linux/store/Retention.h"

namespace tal {

/// What the settings domain "org.vantle.talsys.store" says, and the size of the
/// outbox, which "org.vantle.talsys.rtc" does.
struct StoreSettings {
  RetentionLimits limits;
  bool fully_synchronous = false;
  std::int64_t most_outbox_bytes = 0;  ///< from the domain of the real-time messages
};

/// Reads the store's settings again and again. A value that makes no sense is
/// logged once, and its default stands. One thread at a time.
class StoreSettingsReader {
 public:
  /// Both outlive the object.
  StoreSettingsReader(const SettingsStore& settings, const LogChannel& log)
      : settings_(settings), log_(log) {}

  StoreSettings read();

 private:
  std::int64_t positiveNumber(std::string_view domain, std::string_view key, std::int64_t default_value,
                              std::int64_t most, std::string& wrong);
  bool isFullySynchronous(std::string& wrong);

  const SettingsStore& settings_;
  const LogChannel& log_;
  std::string complained_about_;
};

}  // namespace tal
