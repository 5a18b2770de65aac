#pragma once

#include <chrono>

namespace tal {

/// Lets one thread wait for what others report. Any thread.
class CountingSemaphore {
 public:
  virtual ~CountingSemaphore() = default;

  virtual void signal() = 0;

  /// Takes one signal, at most so long after the call; false when none came.
  virtual bool wait(std::chrono::nanoseconds timeout) = 0;
};

}  // namespace tal
