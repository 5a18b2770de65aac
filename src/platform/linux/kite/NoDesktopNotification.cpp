// Built without sd-bus: there is no way to the desktop.

#include "platform/linux/kite/DesktopNotification.h"

namespace tal {

std::optional<std::string> showDesktopNotification(const DesktopNotification&) {
  return "built without D-Bus";
}

}  // namespace tal
