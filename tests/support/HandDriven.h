#pragma once

// A clock and a queue that move only when the test says so.

#include <algorithm>
#include <cstdint>
#include <deque>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/SerialQueue.h"

namespace tal::test {

class HandClock final : public Clock {
 public:
  double secondsSince1970() const override { return wall_; }
  Instant monotonic() const override { return now_; }
  TimeReading read() const override { return {wall_, uptime_seconds, processor_ticks}; }
  std::string localTimeForFileName() const override { return "20240131-154502+0100"; }
  /// Whoever sleeps moves the clock.
  void sleepFor(std::chrono::nanoseconds duration) const override { move(duration); }

  void advance(std::chrono::nanoseconds by) { move(by); }
  void setWall(double seconds_since_1970) { wall_ = seconds_since_1970; }

  double uptime_seconds = 0;
  std::int64_t processor_ticks = 0;

 private:
  void move(std::chrono::nanoseconds by) const {
    now_ += by;
    wall_ += std::chrono::duration<double>(by).count();
  }

  mutable Instant now_{0};
  mutable double wall_ = 1'800'000'000;
};

class HandQueue final : public SerialQueue {
 public:
  explicit HandQueue(HandClock& clock) : clock_(clock) {}

  void post(Task task) override { ready_.push_back(std::move(task)); }
  void postAfter(std::chrono::nanoseconds delay, Task task) override {
    timers_.push_back({clock_.monotonic() + delay, std::move(task)});
  }
  bool isCurrent() const override { return true; }

  /// Runs what is posted, and what that posts, until nothing is left.
  void runUntilIdle() {
    while (!ready_.empty()) {
      Task task = std::move(ready_.front());
      ready_.pop_front();
      task();
    }
  }

  /// Lets the time pass, firing each timer at its own time.
  void advance(std::chrono::nanoseconds by) {
    const auto end = clock_.monotonic() + by;
    runUntilIdle();
    while (true) {
      const auto next = std::min_element(timers_.begin(), timers_.end(),
                                         [](const Timer& a, const Timer& b) { return a.due < b.due; });
      if (next == timers_.end() || next->due > end) break;
      clock_.advance(next->due - clock_.monotonic());
      ready_.push_back(std::move(next->task));
      timers_.erase(next);
      runUntilIdle();
    }
    clock_.advance(end - clock_.monotonic());
  }

  /// Ends what tasks and queue may hold of each other.
  void dropAll() {
    const auto ready = std::exchange(ready_, {});
    const auto timers = std::exchange(timers_, {});
  }

  std::size_t waitingTimers() const { return timers_.size(); }

 private:
  struct Timer {
    Clock::Instant due;
    Task task;
  };
  HandClock& clock_;
  std::deque<Task> ready_;
  std::vector<Timer> timers_;
};

}  // namespace tal::test
