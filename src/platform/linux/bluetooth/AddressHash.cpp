#include "platform/linux/bluetooth/AddressHash.h"

#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <sys/random.h>

#include <array>
#include <fstream>
#include <iterator>

#include "platform/linux/settings/AtomicFile.h"

namespace tal {

namespace {

constexpr std::size_t kSaltBytes = 32;

std::string hexOf(const unsigned char* bytes, std::size_t count) {
  constexpr std::string_view kHex = "0123456789abcdef";
  std::string text;
  for (std::size_t i = 0; i < count; ++i) {
    text += kHex[bytes[i] >> 4U];
    text += kHex[bytes[i] & 0x0FU];
  }
  return text;
}

}  // namespace

std::optional<std::string> AddressHash::of(std::string_view address, std::string& error) {
  if (salt_.empty() && !takeSalt(error)) return std::nullopt;
  std::array<unsigned char, EVP_MAX_MD_SIZE> hash{};
  unsigned int size = 0;
  if (!::HMAC(EVP_sha256(), salt_.data(), static_cast<int>(salt_.size()),
              reinterpret_cast<const unsigned char*>(address.data()), address.size(), hash.data(), &size)) {
    error = "the address cannot be hashed";
    return std::nullopt;
  }
  return hexOf(hash.data(), size);
}

bool AddressHash::takeSalt(std::string& error) {
  std::error_code status;
  if (!std::filesystem::exists(path_, status) && !status) return makeSalt(error);
  std::ifstream file(path_, std::ios::binary);
  std::string salt{std::istreambuf_iterator<char>(file), {}};
  if (salt.size() != kSaltBytes) {
    // Not made anew: with another salt every accessory would look like a new one.
    error = "the salt " + path_.string() + " cannot be read or is damaged";
    return false;
  }
  salt_ = std::move(salt);
  return true;
}

bool AddressHash::makeSalt(std::string& error) {
  constexpr mode_t kOwnerAlone = 0600;
  std::string salt(kSaltBytes, '\0');
  if (::getrandom(salt.data(), salt.size(), GRND_NONBLOCK) != static_cast<ssize_t>(salt.size())) {
    error = "there is not enough randomness for a salt yet";
    return false;
  }
  if (const std::error_code failure = replaceFile(path_, salt, kOwnerAlone)) {
    error = "the salt " + path_.string() + " cannot be written: " + failure.message();
    return false;
  }
  salt_ = std::move(salt);
  return true;
}

}  // namespace tal
