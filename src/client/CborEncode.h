// CBOR heads and numbers, written in line: a message of 12 keys has some 30 of them, and a call into a
// library for each is most of what a send costs. Shortest forms, as libcbor writes them; room must be there.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tal::clientlib {

enum class CborMajor : unsigned char {
  Unsigned = 0x00,
  Negative = 0x20,
  Bytes = 0x40,
  Text = 0x60,
  Array = 0x80,
  Map = 0xA0,
  Tag = 0xC0
};

/// Room that any head needs: one byte and a 64-bit argument.
constexpr std::size_t kHeadBytes = 9;
constexpr unsigned char kCborFalse = 0xF4;
constexpr unsigned char kCborTrue = 0xF5;
constexpr unsigned char kCborNull = 0xF6;
constexpr unsigned char kCborDouble = 0xFB;
constexpr unsigned char kCborOpenArray = 0x9F;
constexpr unsigned char kCborOpenMap = 0xBF;
constexpr unsigned char kCborBreak = 0xFF;

namespace detail {

inline unsigned char* put64(unsigned char* at, std::uint64_t value) {
  if constexpr (std::endian::native == std::endian::little) value = __builtin_bswap64(value);
  std::memcpy(at, &value, sizeof value);
  return at + sizeof value;
}

}  // namespace detail

/// All functions return where the next item goes.
inline unsigned char* putHead(unsigned char* at, CborMajor major, std::uint64_t argument) {
  const auto type = static_cast<unsigned char>(major);
  if (argument < 24) {
    *at = static_cast<unsigned char>(type | argument);
    return at + 1;
  }
  // The argument's length is 1, 2, 4 or 8 bytes, and the head's low bits count up from 24 with it.
  const unsigned power = argument <= 0xFF ? 0 : argument <= 0xFFFF ? 1 : argument <= 0xFFFFFFFF ? 2 : 3;
  const std::size_t bytes = std::size_t{1} << power;
  *at = static_cast<unsigned char>(type | (24 + power));
  for (std::size_t i = 0; i < bytes; ++i) {
    at[bytes - i] = static_cast<unsigned char>(argument >> (8 * i));
  }
  return at + 1 + bytes;
}

inline unsigned char* putInteger(unsigned char* at, std::int64_t value) {
  // A negative n is written as -1 - n, which is its complement.
  return value >= 0 ? putHead(at, CborMajor::Unsigned, static_cast<std::uint64_t>(value))
                    : putHead(at, CborMajor::Negative, ~static_cast<std::uint64_t>(value));
}

inline unsigned char* putDouble(unsigned char* at, double value) {
  *at = kCborDouble;
  return detail::put64(at + 1, std::bit_cast<std::uint64_t>(value));
}

inline unsigned char* putByte(unsigned char* at, unsigned char byte) {
  *at = byte;
  return at + 1;
}

/// A byte or text string: its head and its bytes.
inline unsigned char* putString(unsigned char* at, CborMajor major, const void* bytes, std::size_t size) {
  at = putHead(at, major, size);
  if (size > 0) std::memcpy(at, bytes, size);
  return at + size;
}

}  // namespace tal::clientlib
