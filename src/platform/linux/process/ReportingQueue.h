#pragma once

// The serial queue that the whole service runs on, as one thread of its own.
// The hand-over decides the daemon's round trip, so it is one mutex, one swap
// of whole vectors, and one wake-up for a burst of posts.

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/SerialQueue.h"

namespace tal {

/// A SerialQueue with a thread. Any thread may post; a thread that sleeps is
/// woken once however much is posted, and while nothing is posted and no timer
/// is due it does not wake up.
///
/// 1. The constructor starts the thread, named after the end of `label`, at the
///    niceness where the process is permitted it.
/// 2. `stop` or `stopDropping` ends it; the destructor does the latter.
/// 3. Whatever is posted after that is destroyed unrun, on the posting thread.
class ReportingQueue final : public SerialQueue {
 public:
  /// Ahead of ordinary work, behind audio threads, which run in real time.
  static constexpr int kRaisedNiceness = -10;
  /// For what must not be felt by anybody.
  static constexpr int kBackgroundNiceness = 10;

  explicit ReportingQueue(std::string_view label, int niceness = kRaisedNiceness);
  ReportingQueue(const ReportingQueue&) = delete;
  ReportingQueue& operator=(const ReportingQueue&) = delete;
  ~ReportingQueue() override;

  void post(Task task) override;
  void postAfter(std::chrono::nanoseconds delay, Task task) override;
  bool isCurrent() const override;

  /// Runs everything posted before this call, then ends the thread. Timers that
  /// are not due, and what those tasks post in turn, are destroyed unrun. Not on
  /// the queue itself.
  void stop();

  /// Ends the thread after the task that it is running; all others are destroyed
  /// unrun. Not on the queue itself.
  void stopDropping();

 private:
  using TimePoint = std::chrono::steady_clock::time_point;
  enum class Ending { kNone, kAfterPosted, kAtOnce };

  struct Timer {
    TimePoint due;
    std::uint64_t number;  // keeps the order of equal due times
    Task task;
  };
  static bool later(const Timer& a, const Timer& b);

  void run();
  void runBatch(std::vector<Task>& batch);
  void takeDueTimers();
  void sleep(std::unique_lock<std::mutex>& lock);
  void end(Ending ending);

  std::mutex mutex_;
  std::condition_variable wake_;
  std::vector<Task> waiting_;
  std::vector<Timer> timers_;  // a heap, the next one due in front
  std::uint64_t next_timer_number_ = 0;
  bool sleeping_ = false;
  std::atomic<Ending> ending_ = Ending::kNone;  // written under the mutex

  std::thread thread_;  // last of the state that it uses
  std::thread::id thread_id_;
};

}  // namespace tal
