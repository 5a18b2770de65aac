#pragma once

// The numbers of the settings domain of the transport.

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "platform/SettingsStore.h"
#include "wire/FrameSplitter.h"

namespace tal {

inline constexpr std::string_view kIpcSettingsDomain = "org.vantle.talsys.ipc";

/// Read anew for each connection. A value that is no integer or outside its
/// range counts as absent.
struct IpcSettings {
  std::uint32_t max_frame_bytes = kDefaultMaxFrameBytes;
  std::size_t max_connections = 1024;
  /// Per connection.
  std::size_t max_kept_bytes = std::size_t{256} << 20;
};

IpcSettings readIpcSettings(const SettingsStore& settings);

}  // namespace tal
