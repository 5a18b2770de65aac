// What the threads of a program touch when they send: the queue, its bell, and the counts.
#include "client/Outbox.h"

#include <algorithm>

#include "client/Requests.h"

namespace tal::clientlib {

namespace {

/// The part of the queue that messages leave to other requests: a sixteenth, and at least room for opening
/// some twenty sessions.
constexpr std::size_t kRequestShare = 16;
constexpr std::size_t kMinForRequests = 4096;

void count(std::atomic<std::uint64_t>& counter) { counter.fetch_add(1, std::memory_order_relaxed); }

}  // namespace

Outbox::Outbox(std::size_t queueBytes, std::size_t maxFrame, bool silent)
    : ring(queueBytes),
      bell(silent),
      maxFrameBytes(maxFrame),
      keptForRequests_(std::max(queueBytes / kRequestShare, kMinForRequests)) {}

bool Outbox::fits(const RecordParts& parts) const {
  return RecordRing::argumentBytes(parts) + kRequestHeadBytes <=
             maxFrameBytes.load(std::memory_order_relaxed) &&
         RecordRing::recordBytes(parts) + keptForRequests_ <= ring.capacity();
}

tal_status Outbox::send(const RecordParts& message) {
  if (life.get() != LifeFlag::State::Open) return drop(TAL_CLOSED);
  if (!fits(message)) return drop(TAL_TOO_LARGE);
  if (!ring.push(message, keptForRequests_)) return drop(TAL_QUEUE_FULL);
  count(counters.accepted);
  bell.knock();
  return TAL_OK;
}

tal_status Outbox::drop(tal_status why) {
  count(why == TAL_QUEUE_FULL  ? counters.droppedQueueFull
        : why == TAL_TOO_LARGE ? counters.droppedTooLarge
        : why == TAL_CLOSED    ? counters.droppedClosed
                               : counters.droppedInvalid);
  return why;
}

tal_status Outbox::request(std::span<const RecordParts> requests) {
  if (life.get() != LifeFlag::State::Open) return TAL_CLOSED;
  const std::lock_guard lock(requests_);
  return pushLocked(requests);
}

tal_status Outbox::pushLocked(std::span<const RecordParts> requests) {
  if (life.get() != LifeFlag::State::Open) return TAL_CLOSED;
  std::size_t together = 0;
  for (const RecordParts& parts : requests) {
    if (!fits(parts)) return TAL_TOO_LARGE;
    together += RecordRing::recordBytes(parts);
  }
  if (together + keptForRequests_ > ring.capacity()) return TAL_TOO_LARGE;
  // Nothing may overtake a session's end: it may be about a session of the same reporter.
  if (!deferred_.empty() || !ring.push(requests, 0)) return TAL_QUEUE_FULL;
  bell.knock();
  return TAL_OK;
}

tal_status Outbox::destroySession(std::int64_t reporter) {
  if (life.get() != LifeFlag::State::Open) return TAL_CLOSED;
  SmallCbor<16> id;
  const RecordParts request{TAL_DESTROY_SESSION, {reporter, 0}, {id.integer(reporter).bytes(), {}, {}}};
  const std::lock_guard lock(requests_);
  const tal_status status = pushLocked({&request, 1});
  if (status != TAL_QUEUE_FULL) return status;
  deferred_.push_back(reporter);
  deferredCount_.store(deferred_.size(), std::memory_order_release);
  return TAL_OK;
}

void Outbox::queueDeferred() {
  if (!hasDeferred()) return;
  const std::lock_guard lock(requests_);
  std::size_t queued = 0;
  for (const std::int64_t reporter : deferred_) {
    SmallCbor<16> id;
    const RecordParts request{TAL_DESTROY_SESSION, {reporter, 0}, {id.integer(reporter).bytes(), {}, {}}};
    if (!ring.push(request, 0)) break;
    ++queued;
  }
  deferred_.erase(deferred_.begin(), deferred_.begin() + static_cast<std::ptrdiff_t>(queued));
  deferredCount_.store(deferred_.size(), std::memory_order_release);
}

void Outbox::close() {
  const std::lock_guard lock(requests_);
  if (life.get() == LifeFlag::State::Open) life.set(LifeFlag::State::Closed);
}

}  // namespace tal::clientlib
