#pragma once

// The last log lines in memory, of all levels, so that a capture can tell what
// led to a fault although nobody had asked for debug lines.

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "core/Log.h"

namespace tal {

/// Keeps every line that it is given and passes on those that the sink behind it
/// is to have. Any thread.
///
/// Channels in front of it must let debug lines through, so each of them is then
/// composed: microseconds for a message. Only internal builds have one.
class LogRing final : public LogSink {
 public:
  static constexpr std::size_t kLines = 2000;
  /// Of a longer line only the beginning is kept, which bounds the memory.
  static constexpr std::size_t kMostLineBytes = 2048;

  /// `next` outlives the ring and gets lines up to that level.
  LogRing(LogSink& next, LogLevel next_most_detailed)
      : next_(next), next_most_detailed_(next_most_detailed), lines_(kLines) {}

  /// `channel` must outlive the ring, as the names of the channels do.
  void write(std::string_view channel, LogLevel level, std::string_view line) override;

  /// The lines, the oldest first, as they stand in a log. Those who log wait for
  /// a small part of the work only; what they write meanwhile may push out the oldest.
  std::string text() const;

 private:
  struct Line {
    double seconds_since_1970 = 0;
    std::string_view channel;
    LogLevel level = LogLevel::kDefault;
    std::string text;  // keeps its memory when overwritten
  };

  LogSink& next_;
  const LogLevel next_most_detailed_;
  mutable std::mutex mutex_;
  std::vector<Line> lines_;
  std::uint64_t count_ = 0;  // of lines ever written: the next goes to count_ % kLines
};

}  // namespace tal
