#include "drivers/MemoryListing.h"

#include <algorithm>
#include <array>
#include <utility>

namespace tal {

namespace {

constexpr std::size_t kLongestPiece = 2047;
constexpr std::size_t kLeastBlock = 512;
constexpr std::string_view kWiredMemory = " wired_mem ";
// In the order in which they are looked for: the first that a line holds decides.
constexpr std::array<std::string_view, 5> kResourceWords{" cpu_time ", " phys_mem ", kWiredMemory,
                                                         " phys_footprint ", "RESOURCE"};
// As the listing writes it for a process that has none, which is nearly every one.
constexpr std::string_view kNoWiredMemory = "wired_mem          0           0           0        none";

bool holds(std::string_view text, std::string_view part) { return text.find(part) != std::string_view::npos; }

}  // namespace

void MemoryListing::add(std::string_view bytes) {
  while (!bytes.empty()) {
    const std::string_view room = bytes.substr(0, kLongestPiece - piece_.size());
    const std::size_t line_end = room.find('\n');
    const std::size_t taken = line_end == std::string_view::npos ? room.size() : line_end + 1;
    piece_ += room.substr(0, taken);
    bytes.remove_prefix(taken);
    if (piece_.size() == kLongestPiece || piece_.back() == '\n') endPiece();
  }
}

std::string MemoryListing::finish() {
  if (!piece_.empty()) endPiece();
  return std::exchange(kept_, {});
}

void MemoryListing::endPiece() {
  if (filter_ == Filter::kEveryLine || isProcessResourceLine(piece_)) {
    kept_ += kMemoryLogPrefix;
    kept_ += ' ';
    kept_ += piece_;
  }
  piece_.clear();
}

bool isProcessResourceLine(std::string_view line) {
  const auto word = std::find_if(kResourceWords.begin(), kResourceWords.end(),
                                 [line](std::string_view each) { return holds(line, each); });
  if (word == kResourceWords.end()) return false;
  return *word != kWiredMemory || !holds(line, kNoWiredMemory);
}

void forEachLogBlock(std::string_view text, const std::function<void(std::size_t, std::string_view)>& write) {
  for (std::size_t number = 1; !text.empty(); ++number) {
    std::size_t length = text.size();
    if (length >= kLeastBlock) {
      const std::size_t line_end = text.find('\n', kLeastBlock);
      length = line_end == std::string_view::npos ? kLeastBlock : line_end + 1;
    }
    write(number, text.substr(0, length));
    text.remove_prefix(length);
  }
}

}  // namespace tal
