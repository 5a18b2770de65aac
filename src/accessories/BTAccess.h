#pragma once

// Which of the paired wireless devices are audio accessories.

#include <optional>
#include <string>
#include <vector>

#include "accessories/BaseUnit.h"
#include "platform/BluetoothDevices.h"

namespace tal {

/// Access to the paired accessories. Not for the reporting queue, since the host
/// may take seconds to answer.
class BTAccess {
 public:
  struct Accessories {
    std::vector<BaseUnit> units;
    /// Set when the host could not be asked: why.
    std::optional<std::string> unavailable;
  };

  /// `devices` outlives the object.
  explicit BTAccess(BluetoothDevices& devices) : devices_(devices) {}

  Accessories pairedAccessories() const;

  /// True for a device that plays or takes sound on behalf of this one: by the
  /// audio services that it offers, or by its class where it announces one.
  /// Phones and computers, which use such services, are none.
  static bool isAudioAccessory(const BluetoothDevices::Device& device);

 private:
  BluetoothDevices& devices_;
};

}  // namespace tal
