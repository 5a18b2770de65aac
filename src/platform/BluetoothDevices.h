#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace tal {

/// The wireless devices that the host is paired with.
///
/// Looking may take seconds, so it is not for the reporting queue. One thread at
/// a time.
class BluetoothDevices {
 public:
  /// What the host knows of one device; empty or absent where it does not.
  struct Device {
    /// Tells the device from others for as long as the host keeps its salt. The
    /// address itself never leaves the implementation.
    std::string address_hash;
    std::string name;
    std::string modalias;                    ///< as "bluetooth:v054Cp0CD3d0204"
    std::uint32_t class_of_device = 0;       ///< the 24 bits that classic devices announce
    std::vector<std::string> service_uuids;  ///< in full length
    std::optional<std::uint8_t> battery_percent;
    std::string firmware;
    bool connected = false;
  };

  struct Listing {
    std::vector<Device> devices;
    /// Set when the host could not be asked: why.
    std::optional<std::string> unavailable;
  };

  virtual ~BluetoothDevices() = default;

  virtual Listing pairedDevices() = 0;
};

}  // namespace tal
