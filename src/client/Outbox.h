// What the threads of a program touch when they send: the queue, its bell, and the counts.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <span>
#include <vector>

#include "client/Doorbell.h"
#include "client/LifeFlag.h"
#include "client/RecordRing.h"
#include "client/talreporting.h"

namespace tal::clientlib {

/// See tal_statistics for each.
struct Counters {
  /// Raised by senders, so it does not share a line with what the library's thread counts.
  alignas(64) std::atomic<std::uint64_t> accepted{0};
  std::atomic<std::uint64_t> droppedQueueFull{0};
  std::atomic<std::uint64_t> droppedTooLarge{0};
  std::atomic<std::uint64_t> droppedInvalid{0};
  std::atomic<std::uint64_t> droppedClosed{0};
  alignas(64) std::atomic<std::uint64_t> written{0};
  std::atomic<std::uint64_t> resent{0};
  std::atomic<std::uint64_t> answered{0};
  std::atomic<std::uint64_t> refused{0};
  std::atomic<std::uint64_t> connects{0};
  std::atomic<std::uint64_t> failedAttempts{0};
  std::atomic<std::uint64_t> ignoredReplies{0};
  std::atomic<bool> connected{false};
  /// The library's thread carries nothing more.
  std::atomic<bool> ended{false};
};

/// What a look-up's record owns until it is answered.
struct LookUp {
  tal_reply_function function;
  void* user;
};

/// Takes requests from any thread. Messages never wait and take no lock. Other requests take one lock, which
/// is never held while anything waits, and have a part of the queue to themselves, so that sessions can still
/// be opened and closed when messages have filled the rest.
class Outbox {
 public:
  /// Throws std::bad_alloc.
  Outbox(std::size_t queueBytes, std::size_t maxFrameBytes, bool silent);

  /// Counts what becomes of the message.
  tal_status send(const RecordParts& message);
  /// Counts a message that did not get as far as send().
  tal_status drop(tal_status why);

  /// All or none.
  tal_status request(std::span<const RecordParts> requests);
  /// Keeps it for later where there is no room, so that it cannot fail.
  tal_status destroySession(std::int64_t reporter);
  /// Queues what destroySession() kept, as far as there is room.
  void queueDeferred();
  bool hasDeferred() const { return deferredCount_.load(std::memory_order_acquire) > 0; }

  /// No request is taken from now on. Messages whose send was under way can still come in.
  void close();

  RecordRing ring;
  Doorbell bell;
  Counters counters;
  LifeFlag life;
  /// The largest frame that the daemon is known to take.
  std::atomic<std::size_t> maxFrameBytes;

 private:
  bool fits(const RecordParts& parts) const;
  tal_status pushLocked(std::span<const RecordParts> requests);

  const std::size_t keptForRequests_;
  std::mutex requests_;
  std::vector<std::int64_t> deferred_;
  std::atomic<std::size_t> deferredCount_{0};
};

}  // namespace tal::clientlib
