#include "platform/linux/settings/DeviceTomlProperties.h"

namespace tal {

std::optional<bool> DeviceTomlProperties::booleanProperty(std::string_view name) const {
  const std::lock_guard lock(mutex_);
  file_.refresh();
  const MessageValue* value = file_.values().find(name);
  if (!value) return std::nullopt;
  if (value->kind() == MessageValue::Kind::kBoolean) return value->toBool();
  if (complained_about_.emplace(name).second) {
    TAL_LOG_ERROR(log_, file_.path().string(), ": ", name, " is not a boolean and is ignored");
  }
  return std::nullopt;
}

}  // namespace tal
