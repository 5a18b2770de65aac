#include "platform/linux/callstat/CallstatSettings.h"

namespace tal {

namespace {

constexpr std::string_view kDomain = "org.vantle.talsys.rtc";

}  // namespace

CallstatSettings CallstatSettingsReader::read() {
  CallstatSettings result;
  std::string wrong;
  if (const auto store = settings_.value(kDomain, "store")) {
    result.store = store->kind() == MessageValue::Kind::kBoolean && store->toBool();
    if (store->kind() != MessageValue::Kind::kBoolean) wrong += " store";
  }
  const std::lock_guard lock(mutex_);
  if (wrong != complained_about_ && !wrong.empty()) {
    TAL_LOG_ERROR(log_, "settings ", kDomain, ":", wrong, " not usable, as if absent");
  }
  complained_about_ = wrong;
  return result;
}

}  // namespace tal
