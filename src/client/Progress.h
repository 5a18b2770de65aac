// Where those wait who want to know how far the library's thread has come.
#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "client/Errors.h"
#include "client/RecordRing.h"

namespace tal::clientlib {

/// May be used from any thread. The lock is never held across a system call or a callback, and senders of
/// messages do not come here.
class Progress {
 public:
  // Those who wait.

  tal_status waitConnected(std::chrono::milliseconds timeout, tal_error* error) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, timeout, [&] { return connected_ || ended_ || why_.status == TAL_REFUSED; });
    if (connected_) return TAL_OK;
    if (error) *error = ended_ ? localError(TAL_CLOSED) : why_;
    if (ended_) return TAL_CLOSED;
    return why_.status == TAL_REFUSED ? TAL_REFUSED : TAL_NOT_CONNECTED;
  }

  /// Waits until the queue has been released up to `target`, and nothing is left that did not fit into it.
  tal_status waitReleased(RecordRing::Position target, std::chrono::milliseconds timeout) {
    std::unique_lock lock(mutex_);
    const auto reached = [&] { return released_ >= target && !deferred_; };
    changed_.wait_for(lock, timeout, [&] { return reached() || ended_; });
    return reached() ? TAL_OK : ended_ ? TAL_CLOSED : TAL_TIMED_OUT;
  }

  // The library's thread.

  void setConnected() {
    const std::lock_guard lock(mutex_);
    connected_ = true;
    changed_.notify_all();
  }
  void setDisconnected(const tal_error& why) {
    const std::lock_guard lock(mutex_);
    connected_ = false;
    why_ = why;
    changed_.notify_all();
  }
  void setReleased(RecordRing::Position released, bool deferred) {
    const std::lock_guard lock(mutex_);
    if (released == released_ && deferred == deferred_) return;
    released_ = released;
    deferred_ = deferred;
    changed_.notify_all();
  }
  void end() {
    const std::lock_guard lock(mutex_);
    connected_ = false;
    ended_ = true;
    changed_.notify_all();
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  bool connected_ = false;
  bool ended_ = false;
  tal_error why_ = makeError(TAL_NOT_CONNECTED, 0, kClientDomain, "no attempt to connect has been made yet");
  RecordRing::Position released_ = 0;
  bool deferred_ = false;
};

}  // namespace tal::clientlib
