#pragma once

// One paired audio accessory, as it is registered.

#include <cstdint>
#include <optional>
#include <string>

#include "core/MessageDict.h"
#include "platform/BluetoothDevices.h"

namespace tal {

/// Who made a product and which one it is.
struct ProductIdentity {
  /// Who gave the vendor its number: "bluetooth" or "usb".
  std::string vendor_source;
  std::uint16_t vendor = 0;
  std::uint16_t product = 0;
  std::uint16_t version = 0;

  friend bool operator==(const ProductIdentity&, const ProductIdentity&) = default;
};

/// Reads "bluetooth:v054Cp0CD3d0204", with "usb" as well; nothing for other text.
std::optional<ProductIdentity> parseModalias(const std::string& modalias);

/// A plain value.
class BaseUnit {
 public:
  explicit BaseUnit(const BluetoothDevices::Device& device);

  const std::string& name() const { return name_; }
  const std::optional<ProductIdentity>& product() const { return product_; }
  const std::optional<std::uint8_t>& batteryPercent() const { return battery_percent_; }
  const std::string& firmware() const { return firmware_; }
  /// Stands for the address, which is not known here.
  const std::string& addressHash() const { return address_hash_; }

  /// What is published: "address_hash", "connected", and where known "name",
  /// "vendor_source", "vendor_id", "product_id", "product_version",
  /// "battery_percent", "firmware".
  MessageDict registration() const;

 private:
  std::string name_;
  std::optional<ProductIdentity> product_;
  std::optional<std::uint8_t> battery_percent_;
  std::string firmware_;
  std::string address_hash_;
  bool connected_;
};

}  // namespace tal
