#pragma once

// Bytes as the tests write them down.

#include <string>
#include <string_view>

namespace tal {

/// The bytes of "82 01 'text' F6": pairs of hex digits, blanks, and literal text
/// in single quotes.
inline std::string hex(std::string_view text) {
  const auto digit = [](char c) { return c <= '9' ? c - '0' : (c | 0x20) - 'a' + 10; };
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == ' ') continue;
    if (text[i] == '\'') {
      const std::size_t end = text.find('\'', i + 1);
      bytes += text.substr(i + 1, end - i - 1);
      i = end;
    } else {
      bytes += static_cast<char>(digit(text[i]) * 16 + digit(text[i + 1]));
      ++i;
    }
  }
  return bytes;
}

inline std::string toHex(std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    if (!text.empty()) text += ' ';
    text += kDigits[byte >> 4U];
    text += kDigits[byte & 0x0FU];
  }
  return text;
}

}  // namespace tal
