#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <utility>

#include "platform/SerialQueue.h"

namespace tal::test {

/// A queue that other threads post to, and whose tasks the test runs itself, one
/// at a time, as they come.
class WaitingQueue final : public SerialQueue {
 public:
  void post(Task task) override {
    const std::lock_guard lock(mutex_);
    waiting_.push_back(std::move(task));
    posted_.notify_one();
  }
  void postAfter(std::chrono::nanoseconds, Task) override { ADD_FAILURE() << "no timers here"; }
  bool isCurrent() const override { return true; }

  /// Runs the next task; fails the test when none comes.
  void runNext() {
    constexpr auto kLongEnough = std::chrono::seconds(30);
    std::unique_lock lock(mutex_);
    if (!posted_.wait_for(lock, kLongEnough, [this] { return !waiting_.empty(); })) {
      FAIL() << "nothing was posted";
    }
    const Task task = std::move(waiting_.front());
    waiting_.pop_front();
    lock.unlock();
    task();
  }

 private:
  std::mutex mutex_;
  std::condition_variable posted_;
  std::deque<Task> waiting_;
};

}  // namespace tal::test
