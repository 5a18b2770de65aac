#pragma once

#include <cassert>
#include <chrono>
#include <functional>

namespace tal {

/// Runs tasks one at a time, in the order in which they were posted. All
/// asynchrony goes through one of these, so that a test runs hours of timers in
/// milliseconds on a hand-driven queue.
///
/// `post` and `postAfter` may be called on any thread and never run the task
/// before they return. Tasks that still wait when the queue is destroyed are
/// destroyed without having run.
class SerialQueue {
 public:
  using Task = std::function<void()>;

  virtual ~SerialQueue() = default;

  virtual void post(Task task) = 0;

  /// Posts the task once `delay` has passed; tasks with equal due times keep
  /// their order. A task cannot be taken back: guard it with a LifeToken.
  virtual void postAfter(std::chrono::nanoseconds delay, Task task) = 0;

  /// True on the thread that runs this queue's tasks.
  virtual bool isCurrent() const = 0;
};

/// The first line of what lives on one queue: in debug builds, ends the process
/// when it runs elsewhere.
inline void assertOnQueue([[maybe_unused]] const SerialQueue& queue) { assert(queue.isCurrent()); }

}  // namespace tal
