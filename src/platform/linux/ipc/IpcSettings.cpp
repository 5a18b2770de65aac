#include "platform/linux/ipc/IpcSettings.h"

#include <optional>

namespace tal {

namespace {

// A frame is held in memory whole.
constexpr std::int64_t kLargestFrameBytes = std::int64_t{1} << 30;
// The kernel's default bound for the descriptors of one process.
constexpr std::int64_t kMostConnections = 1 << 20;
constexpr std::int64_t kMostMebibytes = std::int64_t{1} << 30;
constexpr unsigned kBytesPerMebibyteShift = 20;

template <typename Number>
void read(const SettingsStore& settings, std::string_view key, std::int64_t most, Number& out) {
  const std::optional<MessageValue> value = settings.value(kIpcSettingsDomain, key);
  if (!value) return;
  const bool is_integer =
      value->kind() == MessageValue::Kind::kSigned || value->kind() == MessageValue::Kind::kUnsigned;
  const std::int64_t number = value->toInt64();
  if (is_integer && number > 0 && number <= most) out = static_cast<Number>(number);
}

}  // namespace

IpcSettings readIpcSettings(const SettingsStore& settings) {
  IpcSettings read_settings;
  read(settings, "max_frame_bytes", kLargestFrameBytes, read_settings.max_frame_bytes);
  read(settings, "max_connections", kMostConnections, read_settings.max_connections);
  std::size_t mebibytes = read_settings.max_kept_bytes >> kBytesPerMebibyteShift;
  read(settings, "max_kept_mebibytes", kMostMebibytes, mebibytes);
  read_settings.max_kept_bytes = mebibytes << kBytesPerMebibyteShift;
  return read_settings;
}

}  // namespace tal
