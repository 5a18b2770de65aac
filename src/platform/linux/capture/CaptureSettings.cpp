#include "platform/linux/capture/CaptureSettings.h"

namespace tal {

namespace {

std::uint64_t integer(const SettingsStore& settings, const LogChannel& log, const char* key,
                      std::uint64_t least, std::uint64_t most, std::uint64_t otherwise) {
  const auto value = settings.value(kCaptureSettingsDomain, key);
  if (!value) return otherwise;
  const bool whole =
      value->kind() == MessageValue::Kind::kSigned || value->kind() == MessageValue::Kind::kUnsigned;
  if (whole && *value == MessageValue(value->toUInt64()) && value->toUInt64() >= least &&
      value->toUInt64() <= most) {
    return value->toUInt64();
  }
  TAL_LOG_ERROR(log, kCaptureSettingsDomain, ": ", key, " must be from ", least, " to ", most, "; using ",
                otherwise);
  return otherwise;
}

}  // namespace

CaptureSettings readCaptureSettings(const SettingsStore& settings, const LogChannel& log) {
  const CaptureSettings defaults;
  return {.daily_limit = integer(settings, log, "daily_limit", 0, 1000, defaults.daily_limit),
          .max_bytes = integer(settings, log, "max_mebibytes", 64, 1 << 20, defaults.max_bytes >> 20) << 20};
}

}  // namespace tal
