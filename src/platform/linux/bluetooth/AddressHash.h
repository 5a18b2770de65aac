#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <string_view>

namespace tal {

/// Stands in for addresses in what leaves the device: HMAC-SHA-256 under a secret
/// salt, so that a hash neither leads back to an address, however few there are,
/// nor matches one of another device. One thread at a time.
class AddressHash {
 public:
  /// The salt is made once per device and kept in `directory`, for the owner alone.
  explicit AddressHash(const std::filesystem::path& directory) : path_(directory / "accessory-salt") {}

  /// The hash as 64 hexadecimal digits, or nothing when there is no salt and none
  /// can be kept; `error` then says why.
  std::optional<std::string> of(std::string_view address, std::string& error);

 private:
  bool takeSalt(std::string& error);
  bool makeSalt(std::string& error);

  std::filesystem::path path_;
  std::string salt_;
};

}  // namespace tal
