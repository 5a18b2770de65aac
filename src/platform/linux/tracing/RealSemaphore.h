#pragma once

#include <semaphore>

#include "platform/CountingSemaphore.h"

namespace tal {

class RealSemaphore final : public CountingSemaphore {
 public:
  void signal() override { semaphore_.release(); }
  bool wait(std::chrono::nanoseconds timeout) override { return semaphore_.try_acquire_for(timeout); }

 private:
  std::counting_semaphore<> semaphore_{0};
};

}  // namespace tal
