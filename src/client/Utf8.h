// Whether text is UTF-8: the daemon refuses a message whose text is not, so it is found out where the text is
// given.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tal::clientlib {

/// Length of the well-formed sequence at `bytes` (1 to 4), or 0 where there is none.
inline std::size_t utf8SequenceLength(const unsigned char* bytes, std::size_t available) {
  const unsigned char lead = bytes[0];
  if (lead < 0x80) return 1;
  const std::size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC2 || lead > 0xF4 || length > available) return 0;
  // The second byte's range keeps out overlong forms, surrogates and what lies beyond U+10FFFF.
  const unsigned char low = lead == 0xE0 ? 0xA0 : lead == 0xF0 ? 0x90 : 0x80;
  const unsigned char high = lead == 0xED ? 0x9F : lead == 0xF4 ? 0x8F : 0xBF;
  if (bytes[1] < low || bytes[1] > high) return 0;
  for (std::size_t i = 2; i < length; ++i) {
    if ((bytes[i] & 0xC0) != 0x80) return 0;
  }
  return length;
}

/// Eight bytes at a time through ASCII, which nearly all keys and values are.
inline bool isUtf8(const char* text, std::size_t size) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(text);
  std::size_t at = 0;
  while (at < size) {
    if (size - at >= 8) {
      std::uint64_t word;
      std::memcpy(&word, bytes + at, 8);
      if ((word & 0x8080808080808080U) == 0) {
        at += 8;
        continue;
      }
    }
    const std::size_t length = utf8SequenceLength(bytes + at, size - at);
    if (length == 0) return false;
    at += length;
  }
  return true;
}

}  // namespace tal::clientlib
