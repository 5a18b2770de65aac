#pragma once

// A dictionary key with its hash worked out once: at compile time for the keys
// that the system itself knows, so that a look-up of one costs a scan over
// 32-bit numbers and one comparison of text.

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>
#include <type_traits>

namespace tal {

/// Up to eight bytes as one number.
constexpr std::uint64_t littleEndianWord(std::string_view bytes) {
  std::uint64_t word = 0;
  if (!std::is_constant_evaluated() && std::endian::native == std::endian::little) {
    std::memcpy(&word, bytes.data(), bytes.size());
    return word;
  }
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    word |= static_cast<std::uint64_t>(static_cast<unsigned char>(bytes[i])) << (8 * i);
  }
  return word;
}

/// Hash of a key's bytes. Fixed for all processes, since it is also evaluated at
/// compile time; where a hostile client could choose keys that collide (large
/// dictionaries), `DictShape` uses a seeded index instead.
constexpr std::uint32_t hashKey(std::string_view text) {
  std::uint64_t hash = 0x9E3779B97F4A7C15ULL ^ text.size();
  const auto mix = [&hash](std::uint64_t word) {
    hash = (hash ^ word) * 0xFF51AFD7ED558CCDULL;
    hash ^= hash >> 32;
  };
  while (text.size() >= sizeof(std::uint64_t)) {
    mix(littleEndianWord(text.substr(0, sizeof(std::uint64_t))));
    text.remove_prefix(sizeof(std::uint64_t));
  }
  if (!text.empty()) mix(littleEndianWord(text));
  return static_cast<std::uint32_t>(hash);
}

/// A key to look up. Refers to the text; holds nothing.
struct MessageKey {
  constexpr MessageKey(std::string_view key) : text(key), hash(hashKey(key)) {}
  constexpr MessageKey(const char* key) : MessageKey(std::string_view(key)) {}
  MessageKey(const std::string& key) : MessageKey(std::string_view(key)) {}
  /// `known_hash` must be `hashKey(key)`.
  constexpr MessageKey(std::string_view key, std::uint32_t known_hash) : text(key), hash(known_hash) {}

  std::string_view text;
  std::uint32_t hash;

  friend constexpr bool operator==(const MessageKey& a, const MessageKey& b) {
    return a.hash == b.hash && a.text == b.text;
  }
};

}  // namespace tal
