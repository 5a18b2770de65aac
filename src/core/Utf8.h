#pragma once

// Text that comes from outside is UTF-8 or is refused.

#include <cstddef>
#include <string_view>

namespace tal {

/// True when the bytes are well-formed UTF-8 (RFC 3629: no overlong forms, no
/// surrogates, nothing beyond U+10FFFF).
bool isUtf8(std::string_view bytes);

/// Bytes of the UTF-8 sequence that the text begins with: 1 to 4, or 0 when it
/// is none (or the text is empty). Overlong forms, surrogates and what lies
/// beyond U+10FFFF are none.
constexpr std::size_t utf8SequenceLength(std::string_view text) {
  const auto at = [text](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const auto continues = [&](std::size_t i) { return i < text.size() && (at(i) & 0xC0) == 0x80; };
  if (text.empty()) return 0;
  const unsigned lead = at(0);
  if (lead < 0x80) return 1;
  if (lead < 0xC2 || lead > 0xF4 || !continues(1)) return 0;
  if (lead < 0xE0) return 2;
  const unsigned second = at(1);
  if (lead < 0xF0) {
    const bool overlong = lead == 0xE0 && second < 0xA0;
    const bool surrogate = lead == 0xED && second >= 0xA0;
    return !overlong && !surrogate && continues(2) ? 3 : 0;
  }
  const bool overlong = lead == 0xF0 && second < 0x90;
  const bool beyond = lead == 0xF4 && second >= 0x90;
  return !overlong && !beyond && continues(2) && continues(3) ? 4 : 0;
}

/// True for U+0080 to U+009F, which terminals read as control sequences.
constexpr bool isC1Control(std::string_view sequence) {
  return sequence.size() == 2 && sequence[0] == '\xC2' && static_cast<unsigned char>(sequence[1]) < 0xA0;
}

}  // namespace tal
