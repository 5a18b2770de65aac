#pragma once

#include "platform/BluetoothDevices.h"

namespace tal::test {

/// Answers what it is told to.
class FakeBluetoothDevices final : public BluetoothDevices {
 public:
  Listing pairedDevices() override {
    ++times_asked;
    return listing;
  }

  Listing listing;
  int times_asked = 0;
};

}  // namespace tal::test
