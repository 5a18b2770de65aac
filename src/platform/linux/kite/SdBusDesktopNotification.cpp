// Desktop notifications over D-Bus, as the desktops have agreed on them.

#include <systemd/sd-bus.h>

#include <cstdint>
#include <memory>
#include <system_error>

#include "platform/linux/kite/DesktopNotification.h"

namespace tal {

namespace {

constexpr std::uint64_t kMostMicrosecondsPerCall = 2'000'000;
constexpr std::uint32_t kReplacesNothing = 0;
constexpr std::int32_t kExpiresAsTheDesktopLikes = -1;

struct CloseBus {
  void operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
};

std::string reasonOf(int negative_errno) { return std::generic_category().message(-negative_errno); }

}  // namespace

std::optional<std::string> showDesktopNotification(const DesktopNotification& notification) {
  sd_bus* opened = nullptr;
  if (const int status = sd_bus_open_user(&opened); status < 0) return "no session bus: " + reasonOf(status);
  const std::unique_ptr<sd_bus, CloseBus> bus(opened);
  sd_bus_set_method_call_timeout(bus.get(), kMostMicrosecondsPerCall);
  sd_bus_error error{};
  // Name of the program, what it replaces, icon, title, body, actions, hints, expiry.
  const int status =
      sd_bus_call_method(bus.get(), "org.freedesktop.Notifications", "/org/freedesktop/Notifications",
                         "org.freedesktop.Notifications", "Notify", &error, nullptr, "susssasa{sv}i",
                         "talreportingd", kReplacesNothing, "dialog-information", notification.title.c_str(),
                         notification.body.c_str(), 0, 0, kExpiresAsTheDesktopLikes);
  std::optional<std::string> reason;
  if (status < 0) reason = error.message ? error.message : reasonOf(status);
  sd_bus_error_free(&error);
  return reason;
}

}  // namespace tal
