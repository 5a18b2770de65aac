#pragma once

// A store's progress, moved by hand.

#include <atomic>
#include <cstdint>
#include <mutex>
#include <set>

#include "platform/DurabilityGate.h"

namespace tal::test {

/// Any thread.
class FakeDurabilityGate final : public DurabilityGate {
 public:
  std::uint64_t lastRow() const override { return last_row_.load(); }
  bool wasGivenUp(std::uint64_t first_row, std::uint64_t last_row) const override {
    const std::lock_guard lock(mutex_);
    const auto found = given_up_.lower_bound(first_row);
    return found != given_up_.end() && *found <= last_row;
  }
  void commitSoon() override { ++commits_asked; }
  bool backlogIsOverBound() const override { return over_bound_.load(); }
  void setListener(Listener* listener) override {
    const std::lock_guard lock(mutex_);
    listener_ = listener;
  }

  void appendRow() { ++last_row_; }
  void giveUp(std::uint64_t row) {
    const std::lock_guard lock(mutex_);
    given_up_.insert(row);
  }
  /// All rows up to this one are settled.
  void settle(std::uint64_t up_to) {
    const std::lock_guard lock(mutex_);
    if (listener_) listener_->rowsSettled(up_to);
  }
  void setOverBound(bool over) {
    over_bound_ = over;
    const std::lock_guard lock(mutex_);
    if (!over && listener_) listener_->backlogRelieved();
  }

  std::atomic<int> commits_asked{0};

 private:
  std::atomic<std::uint64_t> last_row_{0};
  std::atomic<bool> over_bound_{false};
  mutable std::mutex mutex_;
  std::set<std::uint64_t> given_up_;
  Listener* listener_ = nullptr;
};

}  // namespace tal::test
