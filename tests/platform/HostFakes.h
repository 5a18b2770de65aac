#pragma once

#include <mutex>
#include <string>
#include <vector>

#include "core/Log.h"
#include "platform/Clock.h"

namespace tal::test {

/// A clock that stands still until it is moved. Any thread.
class StandingClock final : public Clock {
 public:
  double secondsSince1970() const override { return read().seconds_since_1970; }
  Instant monotonic() const override {
    const std::lock_guard lock(mutex_);
    return now_;
  }
  std::string localTimeForFileName() const override { return "20260131-144502+0000"; }
  void sleepFor(std::chrono::nanoseconds) const override {}
  TimeReading read() const override {
    const std::lock_guard lock(mutex_);
    return {.seconds_since_1970 = wall_, .uptime_seconds = 0, .processor_ticks = 0};
  }

  void advance(Instant time) {
    const std::lock_guard lock(mutex_);
    now_ += time;
    wall_ += std::chrono::duration<double>(time).count();
  }
  /// Someone sets the wall clock.
  void setWallClock(double seconds_since_1970) {
    const std::lock_guard lock(mutex_);
    wall_ = seconds_since_1970;
  }

 private:
  mutable std::mutex mutex_;
  Instant now_ = std::chrono::hours(1);
  double wall_ = 1769870702.5;
};

/// Keeps every line, without its source prefix's padding. Any thread.
class RecordingLogSink final : public LogSink {
 public:
  void write(std::string_view, LogLevel level, std::string_view line) override {
    const std::lock_guard lock(mutex_);
    lines_.push_back(std::string(logLevelName(level)) + ": " + std::string(line));
  }
  std::vector<std::string> lines() const {
    const std::lock_guard lock(mutex_);
    return lines_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> lines_;
};

}  // namespace tal::test
