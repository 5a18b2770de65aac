#pragma once

#include <cstddef>
#include <cstdint>

#include "core/Log.h"
#include "platform/SettingsStore.h"

namespace tal {

inline constexpr const char* kCaptureSettingsDomain = "org.vantle.talsys.captures";

struct CaptureSettings {
  /// Most captures in 24 hours ("daily_limit", 0 to 1000).
  std::size_t daily_limit = 20;
  /// Most bytes of all captures together ("max_mebibytes", 64 to 1048576).
  std::uint64_t max_bytes = std::uint64_t{256} << 20;
};

/// What is no integer of its range is logged and read as the default.
CaptureSettings readCaptureSettings(const SettingsStore& settings, const LogChannel& log);

}  // namespace tal
