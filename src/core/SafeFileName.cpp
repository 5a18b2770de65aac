#include "core/SafeFileName.h"

#include <cstddef>

namespace tal {

namespace {

constexpr std::size_t kMostNameBytes = 80;
constexpr unsigned char kDelete = 0x7F;

bool isContinuationByte(char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; }

}  // namespace

std::string safeInFileName(std::string_view text) {
  if (text.size() > kMostNameBytes) {
    std::size_t end = kMostNameBytes;
    while (end > 0 && isContinuationByte(text[end])) --end;
    text = text.substr(0, end);
  }
  std::string safe(text);
  for (char& character : safe) {
    const auto byte = static_cast<unsigned char>(character);
    if (character == '/' || byte < ' ' || byte == kDelete) character = '_';
  }
  for (std::size_t i = 0; i < safe.size() && safe[i] == '.'; ++i) safe[i] = '_';
  return safe;
}

}  // namespace tal
