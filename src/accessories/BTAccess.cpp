#include "accessories/BTAccess.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <string_view>

namespace tal {

namespace {

// Bits 8 to 12 of the class: the kind of device.
constexpr std::uint32_t kMajorClassMask = 0x1F00;
constexpr std::uint32_t kAudioVideo = 0x0400;

// All assigned services are this one with a number of their own in front.
constexpr std::string_view kAssignedServices = "-0000-1000-8000-00805f9b34fb";
// What accessories offer. The other ends of these services (audio source, audio
// gateways) are missing on purpose: phones and computers offer them.
constexpr std::array<std::string_view, 8> kAccessoryServices{
    "00001108",  // headset
    "00001131",  // headset, newer profile
    "0000110b",  // audio sink
    "0000111e",  // hands-free unit
    "0000184e",  // LE audio streams
    "00001850",  // LE audio capabilities
    "00001854",  // hearing access
    "0000fdf0",  // streaming for hearing aids
};

bool isAccessoryService(std::string_view uuid) {
  std::string lower(uuid);
  std::transform(lower.begin(), lower.end(), lower.begin(),
                 [](unsigned char letter) { return static_cast<char>(std::tolower(letter)); });
  return lower.ends_with(kAssignedServices) &&
         std::find(kAccessoryServices.begin(), kAccessoryServices.end(),
                   std::string_view(lower).substr(0, lower.size() - kAssignedServices.size())) !=
             kAccessoryServices.end();
}

}  // namespace

bool BTAccess::isAudioAccessory(const BluetoothDevices::Device& device) {
  return (device.class_of_device & kMajorClassMask) == kAudioVideo ||
         std::any_of(device.service_uuids.begin(), device.service_uuids.end(), isAccessoryService);
}

BTAccess::Accessories BTAccess::pairedAccessories() const {
  const BluetoothDevices::Listing listing = devices_.pairedDevices();
  Accessories found{.units = {}, .unavailable = listing.unavailable};
  for (const BluetoothDevices::Device& device : listing.devices) {
    if (isAudioAccessory(device)) found.units.emplace_back(device);
  }
  return found;
}

}  // namespace tal
