// Whether a connection may be used, in memory that a child process finds empty.
#pragma once

#include <atomic>
#include <cstdint>

namespace tal::clientlib {

/// The kernel clears the flag's page in a child process, so that a send there finds out, for the price of one
/// load, that the thread which would carry its message does not exist.
class LifeFlag {
 public:
  enum class State : std::uint32_t { Foreign = 0, Open = 1, Closed = 2 };

  /// Throws std::bad_alloc.
  LifeFlag();
  ~LifeFlag();
  LifeFlag(const LifeFlag&) = delete;
  LifeFlag& operator=(const LifeFlag&) = delete;

  State get() const { return static_cast<State>(flag_->load(std::memory_order_relaxed)); }
  void set(State state) { flag_->store(static_cast<std::uint32_t>(state), std::memory_order_relaxed); }

 private:
  std::atomic<std::uint32_t>* flag_;
};

}  // namespace tal::clientlib
