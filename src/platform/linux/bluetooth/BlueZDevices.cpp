#include <systemd/sd-bus.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <system_error>
#include <utility>

#include "platform/linux/bluetooth/AddressHash.h"
#include "platform/linux/bluetooth/BlueZObjects.h"
#include "platform/linux/bluetooth/LinuxBluetoothDevices.h"

namespace tal {

namespace {

using SteadyClock = std::chrono::steady_clock;

// The wait holds a thread that others may need, and the daemon's end.
constexpr std::chrono::seconds kLongestWait{2};

struct CloseBus {
  void operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
};
struct UnrefMessage {
  void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Bus = std::unique_ptr<sd_bus, CloseBus>;
using Message = std::unique_ptr<sd_bus_message, UnrefMessage>;

std::string reasonOf(int negative_errno) { return std::generic_category().message(-negative_errno); }

int keepReply(sd_bus_message* reply, void* kept, sd_bus_error*) {
  static_cast<Message*>(kept)->reset(sd_bus_message_ref(reply));
  return 0;
}

// sd_bus_call would wait for the greeting of the bus much longer than for the reply.
int callWithin(sd_bus* bus, sd_bus_message* call, std::chrono::microseconds longest, Message& reply) {
  const SteadyClock::time_point end = SteadyClock::now() + longest;
  const auto limit = static_cast<std::uint64_t>(longest.count());
  int status = sd_bus_call_async(bus, nullptr, call, keepReply, &reply, limit);
  while (status >= 0 && !reply) {
    status = sd_bus_process(bus, nullptr);
    if (status != 0) continue;
    const auto left = std::chrono::duration_cast<std::chrono::microseconds>(end - SteadyClock::now());
    if (left.count() <= 0) return -ETIMEDOUT;
    status = sd_bus_wait(bus, static_cast<std::uint64_t>(left.count()));
  }
  return status;
}

class BlueZDevices final : public BluetoothDevices {
 public:
  explicit BlueZDevices(const std::filesystem::path& state_directory) : address_hash_(state_directory) {}

  Listing pairedDevices() override;

 private:
  AddressHash address_hash_;
};

// The list of BlueZ's objects, or the reason why there is none.
struct Answer {
  Bus bus;  // outlives the reply
  Message reply;
  std::string why_none;
};

Answer askForObjects() {
  Answer answer;
  sd_bus* opened = nullptr;
  int status = sd_bus_open_system(&opened);
  answer.bus.reset(opened);
  if (status < 0) {
    answer.why_none = "no system bus: " + reasonOf(status);
    return answer;
  }
  sd_bus_message* made = nullptr;
  status = sd_bus_message_new_method_call(opened, &made, "org.bluez", "/",
                                          "org.freedesktop.DBus.ObjectManager", "GetManagedObjects");
  const Message call(made);
  if (status >= 0) status = sd_bus_message_set_auto_start(call.get(), 0);
  if (status >= 0) status = callWithin(opened, call.get(), kLongestWait, answer.reply);
  const sd_bus_error* error = answer.reply ? sd_bus_message_get_error(answer.reply.get()) : nullptr;
  if (status < 0) {
    answer.why_none = "no answer from the system bus: " + reasonOf(status);
  } else if (error) {
    answer.why_none = std::string("no BlueZ: ") + (error->message ? error->message : error->name);
  }
  return answer;
}

BluetoothDevices::Listing BlueZDevices::pairedDevices() {
  const Answer answer = askForObjects();
  if (!answer.why_none.empty()) return {.devices = {}, .unavailable = answer.why_none};
  auto objects = readBlueZObjects(answer.reply.get());
  if (!objects) return {.devices = {}, .unavailable = "BlueZ's answer makes no sense"};
  Listing listing;
  std::string error;
  for (BlueZDevice& object : *objects) {
    const auto hash = address_hash_.of(object.address, error);
    if (!hash) return {.devices = {}, .unavailable = error};
    object.device.address_hash = *hash;
    listing.devices.push_back(std::move(object.device));
  }
  return listing;
}

}  // namespace

std::unique_ptr<BluetoothDevices> makeLinuxBluetoothDevices(const std::filesystem::path& state_directory) {
  return std::make_unique<BlueZDevices>(state_directory);
}

}  // namespace tal
