#include "accessories/BaseUnit.h"

#include <charconv>
#include <string_view>

namespace tal {

namespace {

constexpr std::size_t kDigits = 4;

// "v054C…": the number behind the letter, taken off the text.
std::optional<std::uint16_t> takeNumber(std::string_view& text, char letter) {
  if (text.size() < 1 + kDigits || text.front() != letter) return std::nullopt;
  std::uint16_t number = 0;
  const char* const begin = text.data() + 1;
  const char* const end = begin + kDigits;
  if (std::from_chars(begin, end, number, 16).ptr != end) return std::nullopt;
  text.remove_prefix(1 + kDigits);
  return number;
}

}  // namespace

std::optional<ProductIdentity> parseModalias(const std::string& modalias) {
  std::string_view rest = modalias;
  const std::string_view source = rest.substr(0, rest.find(':'));
  if (source != "bluetooth" && source != "usb") return std::nullopt;
  rest.remove_prefix(std::min(rest.size(), source.size() + 1));
  const auto vendor = takeNumber(rest, 'v');
  const auto product = takeNumber(rest, 'p');
  const auto version = takeNumber(rest, 'd');
  if (!vendor || !product || !version || !rest.empty()) return std::nullopt;
  return ProductIdentity{std::string(source), *vendor, *product, *version};
}

BaseUnit::BaseUnit(const BluetoothDevices::Device& device)
    : name_(device.name),
      product_(parseModalias(device.modalias)),
      battery_percent_(device.battery_percent),
      firmware_(device.firmware),
      address_hash_(device.address_hash),
      connected_(device.connected) {}

MessageDict BaseUnit::registration() const {
  MessageDict data{{"address_hash", address_hash_}, {"connected", connected_}};
  if (!name_.empty()) data.set("name", name_);
  if (product_) {
    data.set("vendor_source", product_->vendor_source);
    data.set("vendor_id", product_->vendor);
    data.set("product_id", product_->product);
    data.set("product_version", product_->version);
  }
  if (battery_percent_) data.set("battery_percent", *battery_percent_);
  if (!firmware_.empty()) data.set("firmware", firmware_);
  return data;
}

}  // namespace tal
