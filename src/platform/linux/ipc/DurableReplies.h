#pragma once

// Tells the connections that hold replies back how far the store has got. The
// store speaks on its own thread, once per commit; the replies belong to the
// reporting queue.

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "platform/DurabilityGate.h"
#include "platform/SerialQueue.h"

namespace tal {

/// One connection's held replies. Lives on the reporting queue.
class DurableReplyHolder {
 public:
  virtual ~DurableReplyHolder() = default;

  /// All rows up to `up_to` are settled. True when replies are still held.
  virtual bool rowsSettled(std::uint64_t up_to) = 0;
};

/// Lives on the reporting queue, but for `rowsSettled`.
class DurableReplies {
 public:
  /// Both outlive this.
  DurableReplies(DurabilityGate& gate, SerialQueue& queue) : gate_(gate), queue_(queue) {}
  DurableReplies(const DurableReplies&) = delete;
  DurableReplies& operator=(const DurableReplies&) = delete;

  DurabilityGate& gate() { return gate_; }

  /// A connection asked for durable replies, before it has any message carried
  /// out like that. From the first one on the store is listened to.
  void listen() { listening_.store(true, std::memory_order_relaxed); }

  /// The holder holds replies now, and did not before.
  void add(std::weak_ptr<DurableReplyHolder> holder) { holders_.push_back(std::move(holder)); }

  /// The store's thread. This outlives the queue's tasks.
  void rowsSettled(std::uint64_t up_to);

 private:
  void settle(std::uint64_t up_to);

  DurabilityGate& gate_;
  SerialQueue& queue_;
  // What is carried out after `listen` is settled after it too, so a relaxed
  // read on the store's thread cannot miss it.
  std::atomic<bool> listening_{false};
  std::vector<std::weak_ptr<DurableReplyHolder>> holders_;
};

}  // namespace tal
