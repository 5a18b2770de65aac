#pragma once

#include <mutex>
#include <string>

#include "core/Log.h"
#include "platform/SettingsStore.h"

namespace tal {

/// What the settings domain "org.vantle.talsys.rtc" says of back-ends.
struct CallstatSettings {
  bool store = false;  ///< keep messages in `rtc_messages`
};

/// Reads the settings again and again. A value that makes no sense is logged once,
/// and counts as absent. Any thread.
class CallstatSettingsReader {
 public:
  /// Both outlive the object.
  CallstatSettingsReader(const SettingsStore& settings, const LogChannel& log)
      : settings_(settings), log_(log) {}

  CallstatSettings read();

 private:
  const SettingsStore& settings_;
  const LogChannel& log_;
  std::mutex mutex_;
  std::string complained_about_;
};

}  // namespace tal
