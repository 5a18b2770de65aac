#include "core/SafeFileName.h"

#include <cstddef>

#include "core/Utf8.h"

namespace tal {

namespace {

constexpr std::size_t kMostNameBytes = 80;
constexpr unsigned char kDelete = 0x7F;
constexpr std::size_t kC1Bytes = 2;

bool isUnfit(char character) {
  const auto byte = static_cast<unsigned char>(character);
  return character == '/' || byte < ' ' || byte == kDelete;
}

bool isContinuationByte(char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; }

}  // namespace

std::string safeInFileName(std::string_view text) {
  if (text.size() > kMostNameBytes) {
    std::size_t end = kMostNameBytes;
    while (end > 0 && isContinuationByte(text[end])) --end;
    text = text.substr(0, end);
  }
  std::string safe;
  safe.reserve(text.size());
  while (!text.empty()) {
    const bool is_c1 = isC1Control(text.substr(0, kC1Bytes));
    safe += is_c1 || isUnfit(text.front()) ? '_' : text.front();
    text.remove_prefix(is_c1 ? kC1Bytes : 1);
  }
  for (std::size_t i = 0; i < safe.size() && safe[i] == '.'; ++i) safe[i] = '_';
  return safe;
}

}  // namespace tal
