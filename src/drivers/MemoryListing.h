#pragma once

// What becomes of the output of a memory tool before it is in the log: split into
// lines, filtered, marked, and cut into blocks that a log line can hold.

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>

namespace tal {

/// What every line of a capture begins with.
inline constexpr std::string_view kMemoryLogPrefix = "wiredlog:";

/// Gathers the lines of a capture. One thread at a time.
class MemoryListing {
 public:
  enum class Filter { kEveryLine, kProcessResources };

  explicit MemoryListing(Filter filter) : filter_(filter) {}

  /// Output as it comes. A line of more than 2,047 bytes counts as several.
  void add(std::string_view bytes);

  /// The lines to be logged, each behind the prefix and a blank, once the output
  /// has ended.
  std::string finish();

 private:
  void endPiece();

  const Filter filter_;
  std::string piece_;
  std::string kept_;
};

/// True for a line of the process listing that tells of a resource in use.
bool isProcessResourceLine(std::string_view line);

/// Hands over the text in blocks numbered from 1: each ends with the first line
/// that ends at or behind its 512th character, where there is one, and has
/// exactly 512 otherwise; the last is what remains.
void forEachLogBlock(std::string_view text, const std::function<void(std::size_t, std::string_view)>& write);

}  // namespace tal
