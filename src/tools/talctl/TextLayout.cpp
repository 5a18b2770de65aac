#include "tools/talctl/TextLayout.h"

#include <algorithm>
#include <cassert>
#include <cstdint>
#include <iterator>
#include <numeric>

#include "core/Utf8.h"

namespace tal::talctl {
namespace {

constexpr std::size_t kColumnGap = 2;
constexpr std::size_t kNarrowestText = 6;
constexpr std::string_view kEllipsis = "…";

/// One character, or one byte that begins none.
struct Character {
  std::string_view bytes;
  std::uint32_t code;
  bool valid;
};

Character firstCharacter(std::string_view text) {
  const auto lead = static_cast<unsigned char>(text.front());
  const std::size_t length = lead < 0x80 ? 1 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : 4;
  const std::string_view bytes = text.substr(0, length);
  if (!isUtf8(bytes)) return {text.substr(0, 1), lead, false};
  std::uint32_t code = length == 1 ? lead : lead & (0xFFU >> (length + 1));
  for (const char next : bytes.substr(1)) code = code << 6 | (static_cast<unsigned char>(next) & 0x3FU);
  return {bytes, code, true};
}

struct Range {
  std::uint32_t first;
  std::uint32_t last;
};
bool isIn(std::uint32_t code, const Range* begin, const Range* end) {
  return std::any_of(begin, end,
                     [&](const Range& range) { return code >= range.first && code <= range.last; });
}

// C0, delete and C1; the marks, embeddings, overrides and isolates of bidirectional text.
constexpr Range kHarmful[] = {{0x00, 0x1F},     {0x7F, 0x9F},     {0x200E, 0x200F},
                              {0x2028, 0x202E}, {0x2066, 0x2069}, {0xFEFF, 0xFEFF}};
// Coarse on purpose: a misjudged rare character costs a column, not correctness.
constexpr Range kWithoutWidth[] = {
    {0x300, 0x36F}, {0x200B, 0x200D}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F}, {0xE0100, 0xE01EF}};
constexpr Range kWide[] = {{0x1100, 0x115F},   {0x2E80, 0xA4CF},  {0xAC00, 0xD7A3}, {0xF900, 0xFAFF},
                           {0xFE30, 0xFE6F},   {0xFF00, 0xFF60},  {0xFFE0, 0xFFE6}, {0x1F300, 0x1F64F},
                           {0x1F900, 0x1F9FF}, {0x20000, 0x3FFFD}};

std::size_t characterWidth(std::uint32_t code) {
  if (isIn(code, std::begin(kWithoutWidth), std::end(kWithoutWidth))) return 0;
  return isIn(code, std::begin(kWide), std::end(kWide)) ? 2 : 1;
}

void appendEscape(std::string& out, std::uint32_t code) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  out += "\\u";
  for (int shift = 12; shift >= 0; shift -= 4) out += kDigits[code >> shift & 0xFU];
}

/// The longest beginning of the text that takes at most `width` columns, and at least one character.
std::string_view beginning(std::string_view text, std::size_t width) {
  std::size_t bytes = 0;
  std::size_t columns = 0;
  while (bytes < text.size()) {
    const Character character = firstCharacter(text.substr(bytes));
    columns += characterWidth(character.code);
    if (columns > width && bytes > 0) break;
    bytes += character.bytes.size();
  }
  return text.substr(0, bytes);
}

}  // namespace

std::string escapeControls(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  while (!text.empty()) {
    const Character character = firstCharacter(text);
    if (character.valid && !isIn(character.code, std::begin(kHarmful), std::end(kHarmful))) {
      out += character.bytes;
    } else {
      appendEscape(out, character.code);
    }
    text.remove_prefix(character.bytes.size());
  }
  return out;
}

std::size_t displayWidth(std::string_view text) {
  std::size_t columns = 0;
  while (!text.empty()) {
    const Character character = firstCharacter(text);
    columns += characterWidth(character.code);
    text.remove_prefix(character.bytes.size());
  }
  return columns;
}

std::string cutToWidth(std::string_view text, std::size_t width) {
  if (displayWidth(text) <= width) return std::string(text);
  if (width <= 1) return std::string(width == 1 ? kEllipsis : "");
  std::string_view kept = beginning(text, width - 1);
  if (displayWidth(kept) > width - 1) kept = {};  // a wide character in a column of two
  return std::string(kept) + std::string(kEllipsis);
}

std::vector<std::string> wrapWords(const std::vector<std::string>& words, Width width) {
  std::vector<std::string> lines;
  std::size_t used = 0;
  const auto fits = [&](std::size_t columns) { return !width || columns <= *width; };
  for (std::string_view word : words) {
    const std::size_t columns = displayWidth(word);
    if (!lines.empty() && fits(used + 1 + columns)) {
      lines.back() += ' ';
      lines.back() += word;
      used += 1 + columns;
      continue;
    }
    while (!fits(displayWidth(word))) {
      const std::string_view part = beginning(word, *width);
      if (part.size() == word.size()) break;  // one character that is wider than the line
      lines.emplace_back(part);
      word.remove_prefix(part.size());
    }
    lines.emplace_back(word);
    used = displayWidth(word);
  }
  return lines;
}

Table::Table(std::vector<std::string> heading) {
  right_.resize(heading.size());
  rows_.push_back(std::move(heading));
}

void Table::alignRight(std::size_t column) { right_.at(column) = true; }

void Table::addRow(const std::vector<std::string>& cells) {
  assert(cells.size() == rows_.front().size());
  std::vector<std::string>& row = rows_.emplace_back();
  std::transform(cells.begin(), cells.end(), std::back_inserter(row), escapeControls);
}

std::vector<std::size_t> Table::columnWidths(Width width) const {
  std::vector<std::size_t> widths(rows_.front().size(), 0);
  for (const auto& row : rows_) {
    for (std::size_t i = 0; i < row.size(); ++i) widths[i] = std::max(widths[i], displayWidth(row[i]));
  }
  if (!width) return widths;
  std::size_t total = std::accumulate(widths.begin(), widths.end(), kColumnGap * (widths.size() - 1));
  while (total > *width) {
    std::size_t& widest = widths[columnToNarrow(widths)];
    if (widest <= 1) break;
    --widest;
    --total;
  }
  return widths;
}

/// The widest one; of numbers only where all others have become too narrow to mean anything.
std::size_t Table::columnToNarrow(const std::vector<std::size_t>& widths) const {
  const auto rank = [&](std::size_t column) {
    return std::pair(!right_[column] && widths[column] > kNarrowestText, widths[column]);
  };
  std::size_t chosen = 0;
  for (std::size_t column = 1; column < widths.size(); ++column) {
    if (rank(column) > rank(chosen)) chosen = column;
  }
  return chosen;
}

std::string Table::text(Width width) const {
  const std::vector<std::size_t> widths = columnWidths(width);
  std::string out;
  for (const auto& row : rows_) {
    std::string line;
    for (std::size_t i = 0; i < row.size(); ++i) {
      const std::string cell = cutToWidth(row[i], widths[i]);
      const std::string blanks(widths[i] - displayWidth(cell), ' ');
      line += right_[i] ? blanks + cell : cell + blanks;
      line.append(kColumnGap, ' ');
    }
    line.erase(line.find_last_not_of(' ') + 1);
    out += line + '\n';
  }
  return out;
}

}  // namespace tal::talctl
