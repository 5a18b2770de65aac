#include "platform/linux/store/StoreSettings.h"

namespace tal {

namespace {

constexpr std::string_view kDomain = "org.vantle.talsys.store";
constexpr std::string_view kRtcDomain = "org.vantle.talsys.rtc";
constexpr std::int64_t kDefaultOutboxMebibytes = 64;
constexpr std::int64_t kDefaultDays = 30;
constexpr std::int64_t kMostDays = 36500;
constexpr std::int64_t kDefaultMebibytes = 512;
constexpr std::int64_t kMostMebibytes = 1024 * 1024;
constexpr std::int64_t kBytesPerMebibyte = 1024 * 1024;

}  // namespace

StoreSettings StoreSettingsReader::read() {
  std::string wrong;
  StoreSettings result;
  result.limits.most_age =
      std::chrono::days(positiveNumber(kDomain, "retain_days", kDefaultDays, kMostDays, wrong));
  result.limits.most_bytes =
      positiveNumber(kDomain, "max_mebibytes", kDefaultMebibytes, kMostMebibytes, wrong) * kBytesPerMebibyte;
  result.most_outbox_bytes =
      positiveNumber(kRtcDomain, "outbox_mebibytes", kDefaultOutboxMebibytes, kMostMebibytes, wrong) *
      kBytesPerMebibyte;
  result.fully_synchronous = isFullySynchronous(wrong);
  if (wrong != complained_about_ && !wrong.empty()) {
    TAL_LOG_ERROR(log_, "settings ", kDomain, ":", wrong, " not usable, the default stands");
  }
  complained_about_ = wrong;
  return result;
}

std::int64_t StoreSettingsReader::positiveNumber(std::string_view domain, std::string_view key,
                                                 std::int64_t default_value, std::int64_t most,
                                                 std::string& wrong) {
  const auto value = settings_.value(domain, key);
  if (!value) return default_value;
  const bool usable = value->isNumber() && value->kind() != MessageValue::Kind::kBoolean &&
                      value->toInt64() >= 1 && value->toInt64() <= most;
  if (usable) return value->toInt64();
  wrong += ' ';
  wrong += key;
  return default_value;
}

bool StoreSettingsReader::isFullySynchronous(std::string& wrong) {
  const auto value = settings_.value(kDomain, "synchronous");
  if (!value || value->string() == "normal") return false;
  if (value->string() == "full") return true;
  wrong += " synchronous";
  return false;
}

}  // namespace tal
