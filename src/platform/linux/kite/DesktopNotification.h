#pragma once

#include <optional>
#include <string>

namespace tal {

/// What a person at the desktop is to see.
struct DesktopNotification {
  std::string title;
  std::string body;
};

/// Shows it through the session bus of the daemon's user. Waits for the bus, for
/// seconds where it hangs. The reason when nobody shows it, which is how it is
/// wherever no desktop runs.
std::optional<std::string> showDesktopNotification(const DesktopNotification& notification);

}  // namespace tal
