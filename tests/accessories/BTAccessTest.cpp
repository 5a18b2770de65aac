#include <gtest/gtest.h>

#include <string>

#include "accessories/BTAccess.h"
#include "support/FakeBluetoothDevices.h"

namespace tal {
namespace {

using Device = BluetoothDevices::Device;

std::string service(const std::string& number) { return number + "-0000-1000-8000-00805f9b34fb"; }

TEST(BTAccess, AudioAccessoriesAreToldByTheirServicesOrTheirClass) {
  struct Row {
    const char* what;
    std::uint32_t class_of_device;
    std::vector<std::string> services;
    bool is_accessory;
  };
  const std::vector<Row> rows{
      {"headphones by class alone", 0x240418, {}, true},
      {"speaker by its sink", 0, {service("0000110b")}, true},
      {"hands-free unit, in capitals", 0, {"0000111E-0000-1000-8000-00805F9B34FB"}, true},
      {"hearing aid", 0, {service("00001800"), service("0000fdf0")}, true},
      {"LE earbuds", 0, {service("0000184e")}, true},
      {"phone: gateway and source",
       0x5A020C,
       {service("0000110a"), service("0000111f"), service("00001112")},
       false},
      {"laptop with the audio service bit", 0x3C010C, {service("0000110a")}, false},
      {"keyboard", 0x002540, {service("00001124")}, false},
      {"a maker's own service", 0, {"0000110b-1111-2222-3333-00805f9b34fb"}, false},
      {"nothing known", 0, {}, false},
  };
  for (const Row& row : rows) {
    Device device;
    device.class_of_device = row.class_of_device;
    device.service_uuids = row.services;
    EXPECT_EQ(BTAccess::isAudioAccessory(device), row.is_accessory) << row.what;
  }
}

TEST(BTAccess, ProductsAreReadFromWellFormedIdentifiersOnly) {
  EXPECT_EQ(parseModalias("bluetooth:v054Cp0CD3d0204"),
            (ProductIdentity{"bluetooth", 0x054C, 0x0CD3, 0x0204}));
  EXPECT_EQ(parseModalias("usb:v05ACp200Ed0a01"), (ProductIdentity{"usb", 0x05AC, 0x200E, 0x0A01}));
  for (const char* text : {"", "usb", "usb:", "acpi:v05ACp200Ed0A01", "usb:v05ACp200E", "usb:v05ACp200Ed0A0",
                           "usb:v05ACp200Ed0A01x", "usb:v+5ACp200Ed0A01", "usb:v05 Cp200Ed0A01",
                           "usb:p200Ev05ACd0A01", "bluetooth:vVVVVpPPPPdDDDD"}) {
    EXPECT_EQ(parseModalias(text), std::nullopt) << text;
  }
}

TEST(BTAccess, ListsTheAccessoriesAmongThePairedDevicesAsTheyAreRegistered) {
  test::FakeBluetoothDevices devices;
  Device keyboard;
  keyboard.name = "Keys";
  Device headphones;
  headphones.address_hash = "ab12";
  headphones.name = "WH-1000";
  headphones.modalias = "usb:v054Cp0CD3d0204";
  headphones.class_of_device = 0x240404;
  headphones.battery_percent = 70;
  headphones.firmware = "2.1.0";
  headphones.connected = true;
  Device bare;
  bare.address_hash = "cd34";
  bare.class_of_device = 0x240404;
  devices.listing.devices = {keyboard, headphones, bare};
  const auto found = BTAccess(devices).pairedAccessories();
  ASSERT_EQ(found.units.size(), 2U);
  EXPECT_EQ(
      found.units[0].registration().text(),
      "{address_hash=ab12, connected=1, name=WH-1000, vendor_source=usb, vendor_id=1356, product_id=3283, "
      "product_version=516, battery_percent=70, firmware=2.1.0}");
  EXPECT_EQ(found.units[1].registration().text(), "{address_hash=cd34, connected=0}");
}

}  // namespace
}  // namespace tal
