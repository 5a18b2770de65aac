#include "platform/linux/bluetooth/BlueZObjects.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <functional>
#include <map>
#include <string_view>
#include <utility>

#include "core/Utf8.h"

namespace tal {

namespace {

// What Bluetooth allows a name to be long; no other text here needs more.
constexpr std::size_t kLongestText = 248;
// Paired devices, and what tells their firmware: a dozen or two in real life.
constexpr std::size_t kMostObjects = 256;
constexpr std::size_t kMostServices = 128;
constexpr std::uint8_t kFullBattery = 100;
constexpr std::uint8_t kNoBattery = 255;
// "Firmware Revision String" of the device information service.
constexpr std::string_view kFirmwareCharacteristic = "00002a26-0000-1000-8000-00805f9b34fb";

std::string cut(std::string_view text) {
  std::size_t size = 0;
  while (size < text.size()) {
    const std::size_t length = utf8SequenceLength(text.substr(size));
    if (length == 0 || size + length > kLongestText) break;
    size += length;
  }
  return std::string(text.substr(0, size));
}

// One object as far as it matters here. Flags are what the bus makes of them.
struct Object {
  int paired = 0;
  int connected = 0;
  std::string address;
  std::string alias;
  std::uint8_t battery_percent = kNoBattery;
  std::string characteristic;
  std::string value;
  BluetoothDevices::Device device;
};

class Reader {
 public:
  explicit Reader(sd_bus_message* message) : message_(message) {}

  /// False once the message was not what it had to be.
  bool ok() const { return ok_; }

  /// Calls `entry` at each entry of a dictionary whose entries have these types;
  /// it reads or skips the whole entry.
  void forEachEntry(const char* types, const std::function<void()>& entry) {
    const std::string entry_types = "{" + std::string(types) + "}";
    if (!enter('a', entry_types.c_str())) return;
    while (ok_ && enter('e', types)) {
      entry();
      leave();
    }
    leave();
  }

  /// An object path or text, by type.
  std::string text(char type) {
    const char* text = nullptr;
    check(sd_bus_message_read_basic(message_, type, &text));
    return ok_ && text ? text : "";
  }

  void skip(const char* types) { check(sd_bus_message_skip(message_, types)); }

  /// Reads a variant of this type by `read`, and passes over any other.
  void variant(const char* type, const std::function<void()>& read) {
    const char* contents = nullptr;
    check(sd_bus_message_peek_type(message_, nullptr, &contents));
    if (!ok_) return;
    if (std::string_view(contents) != type) return skip("v");
    if (!enter('v', type)) return;
    read();
    leave();
  }

  void readText(std::string& to) {
    variant("s", [&] { to = cut(text('s')); });
  }
  template <typename Basic>
  void readBasic(const char* type, Basic& to) {
    variant(type, [&] { check(sd_bus_message_read_basic(message_, *type, &to)); });
  }
  void readTexts(std::vector<std::string>& to) {
    variant("as", [&] {
      if (!enter('a', "s")) return;
      while (ok_ && sd_bus_message_at_end(message_, 0) == 0) {
        std::string each = cut(text('s'));
        if (to.size() < kMostServices) to.push_back(std::move(each));
      }
      leave();
    });
  }
  void readBytesAsText(std::string& to) {
    variant("ay", [&] {
      const void* bytes = nullptr;
      std::size_t size = 0;
      check(sd_bus_message_read_array(message_, 'y', &bytes, &size));
      if (!ok_ || size == 0) return;
      const std::string_view text(static_cast<const char*>(bytes), size);
      to = cut(text.substr(0, text.find('\0')));  // some devices terminate it
    });
  }

 private:
  void check(int status) { ok_ = ok_ && status >= 0; }
  bool enter(char type, const char* contents) {
    const int status = sd_bus_message_enter_container(message_, type, contents);
    check(status);
    return status > 0;
  }
  void leave() {
    if (ok_) check(sd_bus_message_exit_container(message_));
  }

  sd_bus_message* message_;
  bool ok_ = true;
};

struct Property {
  std::string_view interface;
  std::string_view name;
  void (*read)(Reader&, Object&);
};
constexpr std::array<Property, 11> kProperties{{
    {"org.bluez.Device1", "Address", [](Reader& in, Object& to) { in.readText(to.address); }},
    {"org.bluez.Device1", "Name", [](Reader& in, Object& to) { in.readText(to.device.name); }},
    {"org.bluez.Device1", "Alias", [](Reader& in, Object& to) { in.readText(to.alias); }},
    {"org.bluez.Device1", "Modalias", [](Reader& in, Object& to) { in.readText(to.device.modalias); }},
    {"org.bluez.Device1", "Class",
     [](Reader& in, Object& to) { in.readBasic("u", to.device.class_of_device); }},
    {"org.bluez.Device1", "UUIDs", [](Reader& in, Object& to) { in.readTexts(to.device.service_uuids); }},
    {"org.bluez.Device1", "Paired", [](Reader& in, Object& to) { in.readBasic("b", to.paired); }},
    {"org.bluez.Device1", "Connected", [](Reader& in, Object& to) { in.readBasic("b", to.connected); }},
    {"org.bluez.Battery1", "Percentage",
     [](Reader& in, Object& to) { in.readBasic("y", to.battery_percent); }},
    {"org.bluez.GattCharacteristic1", "UUID", [](Reader& in, Object& to) { in.readText(to.characteristic); }},
    {"org.bluez.GattCharacteristic1", "Value", [](Reader& in, Object& to) { in.readBytesAsText(to.value); }},
}};

void readInterface(Reader& in, Object& object) {
  const std::string interface = in.text('s');
  in.forEachEntry("sv", [&] {
    const std::string name = in.text('s');
    const auto known = std::find_if(kProperties.begin(), kProperties.end(), [&](const Property& property) {
      return property.interface == interface && property.name == name;
    });
    if (known == kProperties.end()) return in.skip("v");
    known->read(in, object);
  });
}

// Objects by their paths: what belongs to a device stands below the device's own.
using Objects = std::map<std::string, Object>;

std::string firmwareOf(const std::string& device_path, const Objects& objects) {
  const std::string below = device_path + '/';
  for (auto at = objects.lower_bound(below); at != objects.end() && at->first.starts_with(below); ++at) {
    if (at->second.characteristic == kFirmwareCharacteristic) return at->second.value;
  }
  return {};
}

}  // namespace

std::optional<std::vector<BlueZDevice>> readBlueZObjects(sd_bus_message* reply) {
  Reader in(reply);
  Objects objects;
  in.forEachEntry("oa{sa{sv}}", [&] {
    std::string path = in.text('o');
    Object object;
    in.forEachEntry("sa{sv}", [&] { readInterface(in, object); });
    const bool matters = object.paired || object.characteristic == kFirmwareCharacteristic;
    if (matters && objects.size() < kMostObjects) objects.emplace(std::move(path), std::move(object));
  });
  if (!in.ok()) return std::nullopt;

  std::vector<BlueZDevice> devices;
  for (auto& [path, object] : objects) {
    if (!object.paired || object.address.empty()) continue;
    BluetoothDevices::Device& device = object.device;
    if (device.name.empty()) device.name = std::move(object.alias);
    device.connected = object.connected != 0;
    if (object.battery_percent <= kFullBattery) device.battery_percent = object.battery_percent;
    device.firmware = firmwareOf(path, objects);
    devices.push_back({std::move(object.address), std::move(device)});
  }
  return devices;
}

}  // namespace tal
