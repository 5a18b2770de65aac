#include "core/Base64.h"

#include <array>
#include <cstddef>
#include <cstdint>

namespace tal {

void appendBase64(std::string& out, std::string_view bytes) {
  constexpr std::string_view kDigits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  constexpr std::size_t kGroup = 3;
  out.reserve(out.size() + (bytes.size() + kGroup - 1) / kGroup * 4);
  for (std::size_t at = 0; at < bytes.size(); at += kGroup) {
    const std::string_view group = bytes.substr(at, kGroup);
    std::uint32_t bits = 0;
    for (std::size_t i = 0; i < kGroup; ++i) {
      bits = bits << 8 | (i < group.size() ? static_cast<unsigned char>(group[i]) : 0U);
    }
    const std::array<char, 4> digits{kDigits[bits >> 18], kDigits[bits >> 12 & 63], kDigits[bits >> 6 & 63],
                                     kDigits[bits & 63]};
    for (std::size_t i = 0; i < digits.size(); ++i) out += i <= group.size() ? digits[i] : '=';
  }
}

}  // namespace tal
