#include "platform/linux/logging/RepeatedLines.h"

#include <chrono>
#include <utility>

namespace tal {

RepeatedLines::RepeatedLines(std::unique_ptr<LogSink> next, const Clock& clock)
    : next_(std::move(next)), clock_(clock) {}

RepeatedLines::~RepeatedLines() { tellOfHidden(); }

void RepeatedLines::write(std::string_view channel, LogLevel level, std::string_view line) {
  const std::lock_guard lock(mutex_);
  const Clock::Instant now = clock_.monotonic();
  const bool repeats = level == level_ && channel == channel_ && line == line_;
  if (!repeats || now - second_began_ >= std::chrono::seconds(1)) {
    tellOfHidden();
    channel_ = channel;
    level_ = level;
    line_ = line;
    second_began_ = now;
    shown_ = 0;
  }
  if (shown_ == kShownPerSecond) {
    ++hidden_;
    return;
  }
  ++shown_;
  next_->write(channel, level, line);
}

void RepeatedLines::tellOfHidden() {
  if (hidden_ == 0) return;
  next_->write(channel_, level_, line_ + " (" + std::to_string(hidden_) + " more of these)");
  hidden_ = 0;
}

}  // namespace tal
