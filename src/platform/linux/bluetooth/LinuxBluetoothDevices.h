#pragma once

#include <filesystem>
#include <memory>

#include "platform/BluetoothDevices.h"

namespace tal {

/// The devices that BlueZ knows, asked for over the system bus. Neither BlueZ nor
/// a bus is started for the question, and no connection is kept. A bus that does
/// not answer within two seconds counts as none.
///
/// `state_directory` keeps the salt of the address hashes. In a build without the
/// libraries for it, every listing says so.
std::unique_ptr<BluetoothDevices> makeLinuxBluetoothDevices(const std::filesystem::path& state_directory);

}  // namespace tal
