#pragma once

// Private queues without threads of their own, run by few threads that share
// them: ten thousand sessions may each have one.

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include "platform/SerialQueuePool.h"

namespace tal {

/// A pool of up to `most_threads` threads: while one works, another stands by for
/// the other queues, and those that find nothing to do go, but for two.
///
/// Posting is made for the reporting queue: it costs a lock and an entry. A
/// thread that runs out of work looks again a moment later before it sleeps for
/// good, so that a stream of posts pays few wake-ups; an idle pool never wakes.
///
/// 1. The constructor starts the first thread.
/// 2. Queues are made and posted to, on any thread.
/// 3. `stop` (the destructor calls it) runs what was posted before and ends the
///    threads. What is posted later, and timers that are not due, are destroyed
///    unrun.
class ElasticQueuePool final : public SerialQueuePool {
 public:
  struct Bounds {
    std::size_t most_threads = 4;
    /// Past this many tasks that wait, all queues together, `overBound` is true,
    /// until there are half as many.
    std::size_t most_waiting = 16'384;
  };
  /// Told on any thread that the answer of `overBound` may have changed; calls
  /// can come in either order, so the answer must be asked for.
  using BackLogObserver = std::function<void()>;

  ElasticQueuePool() : ElasticQueuePool(Bounds{}) {}
  explicit ElasticQueuePool(Bounds bounds);
  ElasticQueuePool(const ElasticQueuePool&) = delete;
  ElasticQueuePool& operator=(const ElasticQueuePool&) = delete;
  ~ElasticQueuePool() override;

  std::shared_ptr<SerialQueue> makeQueue(std::string_view label) override;

  /// True while more work waits than should: who can, makes its source wait.
  bool overBound() const { return over_bound_.load(std::memory_order_acquire); }

  /// Replaces the observer (empty: none). When this returns, the old one is not
  /// running and will not be called again; so not from within an observer.
  void observeBackLog(BackLogObserver observer);

  /// Not on a thread of the pool.
  void stop();

  std::size_t threadCount() const;

 private:
  class Queue;
  using TimePoint = std::chrono::steady_clock::time_point;
  using Lock = std::unique_lock<std::mutex>;
  struct Timer {
    TimePoint due;
    std::uint64_t number;  // keeps the order of equal due times
    std::shared_ptr<Queue> queue;
    SerialQueue::Task task;
  };
  static bool later(const Timer& a, const Timer& b);

  void post(Queue& queue, SerialQueue::Task task);
  void postAfter(Queue& queue, std::chrono::nanoseconds delay, SerialQueue::Task task);
  bool enqueue(Queue& queue, SerialQueue::Task task);
  void addThread();
  void run();
  void runQueue(Lock& lock);
  void takeDueTimers();
  bool waitForWork(Lock& lock);
  bool updateBound();
  void announceBackLog();

  const Bounds bounds_;
  mutable std::mutex mutex_;
  std::condition_variable wake_;
  std::condition_variable ended_;
  std::deque<std::shared_ptr<Queue>> ready_;
  std::vector<Timer> timers_;  // a heap, the next one due in front
  std::uint64_t next_timer_number_ = 0;
  std::size_t waiting_tasks_ = 0;
  std::size_t threads_ = 0;
  std::size_t sleeping_ = 0;   // threads that must be woken
  std::size_t lingering_ = 0;  // threads that will look again by themselves
  std::size_t wake_ups_ = 0;   // given, and not taken yet
  bool stopping_ = false;
  std::atomic<bool> over_bound_ = false;

  std::mutex observer_mutex_;
  BackLogObserver observer_;
};

}  // namespace tal
