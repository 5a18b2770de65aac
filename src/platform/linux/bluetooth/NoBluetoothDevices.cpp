// Stands in for BlueZDevices.cpp in a build without the bus's library or the one
// that hashes addresses.

#include "platform/linux/bluetooth/LinuxBluetoothDevices.h"

namespace tal {

namespace {

class NoBluetoothDevices final : public BluetoothDevices {
 public:
  Listing pairedDevices() override { return {.devices = {}, .unavailable = "built without Bluetooth"}; }
};

}  // namespace

std::unique_ptr<BluetoothDevices> makeLinuxBluetoothDevices(const std::filesystem::path&) {
  return std::make_unique<NoBluetoothDevices>();
}

}  // namespace tal
