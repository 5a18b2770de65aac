#include "core/Utf8.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tal {

namespace {

constexpr std::uint64_t kHighBits = 0x8080808080808080ULL;

// Nearly all text is ASCII and short, and each text of each message is looked at.
bool isAscii(std::string_view bytes) {
  constexpr std::size_t kWord = sizeof(std::uint64_t);
  std::uint64_t seen = 0;
  if (bytes.size() < kWord) {
    for (const char byte : bytes) seen |= static_cast<unsigned char>(byte);
    return (seen & kHighBits) == 0;
  }
  const auto word = [bytes](std::size_t at) {
    std::uint64_t value = 0;
    std::memcpy(&value, bytes.data() + at, sizeof value);
    return value;
  };
  for (std::size_t at = 0; at + kWord <= bytes.size(); at += kWord) seen |= word(at);
  return ((seen | word(bytes.size() - kWord)) & kHighBits) == 0;
}

}  // namespace

bool isUtf8(std::string_view bytes) {
  if (isAscii(bytes)) return true;
  while (!bytes.empty()) {
    if (bytes.size() >= sizeof(std::uint64_t)) {
      std::uint64_t word = 0;
      std::memcpy(&word, bytes.data(), sizeof word);
      if ((word & kHighBits) == 0) {
        bytes.remove_prefix(sizeof word);
        continue;
      }
    }
    const std::size_t length = utf8SequenceLength(bytes);
    if (length == 0) return false;
    bytes.remove_prefix(length);
  }
  return true;
}

}  // namespace tal
