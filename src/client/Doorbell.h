// Wakes the library's thread, at no cost while that is awake.
#pragma once

#include <atomic>

namespace tal::clientlib {

/// An eventfd that is written to only when the thread has said that it goes to sleep.
///
/// The sleeper arms the bell, looks once more whether there is something to do, and only then sleeps on
/// `fd()`.
class Doorbell {
 public:
  /// `silent`: knock() does nothing, because the thread looks by itself. Throws std::bad_alloc.
  explicit Doorbell(bool silent);
  ~Doorbell();
  Doorbell(const Doorbell&) = delete;
  Doorbell& operator=(const Doorbell&) = delete;

  // Any thread.

  /// Wakes the thread if it sleeps with the bell armed. One of several callers makes the system call.
  void knock() {
    if (armed_.load(std::memory_order_seq_cst) && armed_.exchange(false, std::memory_order_seq_cst)) ring();
  }
  /// Wakes the thread, or keeps it from falling asleep, whatever it waits for.
  void ring() const;

  // The sleeper's thread.

  bool silent() const { return silent_; }
  void arm() { armed_.store(!silent_, std::memory_order_seq_cst); }
  void disarm() { armed_.store(false, std::memory_order_relaxed); }
  /// Makes a bell that was rung quiet again.
  void quieten() const;
  int fd() const { return fd_; }

 private:
  /// Not on a line with what others write: producers read it at each send.
  alignas(64) std::atomic<bool> armed_{false};
  const bool silent_;
  int fd_;
};

}  // namespace tal::clientlib
