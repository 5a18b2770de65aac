#pragma once

// Keeps one line that is logged for every message from filling the log and from
// setting the pace: a write to a log costs more than a message does.

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

#include "core/Log.h"
#include "platform/Clock.h"

namespace tal {

/// Passes on what it is given, but of equal lines that follow one another only
/// `kShownPerSecond` in a second. The others are counted, and the number is told
/// by a line of its own before the next line that differs, with the first equal
/// one of another second, or at the end. Any thread.
class RepeatedLines final : public LogSink {
 public:
  static constexpr std::uint64_t kShownPerSecond = 100;

  /// `clock` outlives this.
  RepeatedLines(std::unique_ptr<LogSink> next, const Clock& clock);
  RepeatedLines(const RepeatedLines&) = delete;
  RepeatedLines& operator=(const RepeatedLines&) = delete;
  ~RepeatedLines() override;

  /// `channel` must outlive this, as the names of the channels do.
  void write(std::string_view channel, LogLevel level, std::string_view line) override;

 private:
  void tellOfHidden();

  const std::unique_ptr<LogSink> next_;
  const Clock& clock_;
  std::mutex mutex_;
  std::string_view channel_;
  LogLevel level_ = LogLevel::kDefault;
  std::string line_;
  Clock::Instant second_began_{};
  std::uint64_t shown_ = 0;   // in this second
  std::uint64_t hidden_ = 0;  // since the last one shown
};

}  // namespace tal
