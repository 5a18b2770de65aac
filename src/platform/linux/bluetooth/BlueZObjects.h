#pragma once

// What BlueZ says of its objects, read from one reply.

#include <systemd/sd-bus.h>

#include <optional>
#include <string>
#include <vector>

#include "platform/BluetoothDevices.h"

namespace tal {

/// A paired device, and the address that must not leave this folder.
struct BlueZDevice {
  std::string address;
  BluetoothDevices::Device device;  ///< without a hash yet
};

/// Reads the reply of GetManagedObjects: a dictionary of objects, their
/// interfaces and the properties of these. Properties of an unexpected type count
/// as missing; at most 256 objects are read and texts are cut. Nothing when the
/// reply is no such dictionary.
std::optional<std::vector<BlueZDevice>> readBlueZObjects(sd_bus_message* reply);

}  // namespace tal
