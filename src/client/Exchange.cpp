// The requests of a program on their way: written to the socket, waiting for their replies, done.
#include "client/Exchange.h"

#include <algorithm>
#include <bit>
#include <memory>
#include <thread>

#include "client/Errors.h"
#include "client/Requests.h"

namespace tal::clientlib {

namespace {

/// As much as is copied out of the queue before it is written: enough that a system call is paid for many
/// messages.
constexpr std::size_t kStageBytes = std::size_t{64} << 10;
/// Starts whose answers may still come. A session has two at most that count: one that its stop answers, and
/// one of before that, on its way. Starts of started sessions, which are never answered, would otherwise pile
/// up.
constexpr std::size_t kLateCallsPerReporter = 2;

bool isLookUp(tal_operation operation) {
  return operation == TAL_LOOK_UP_SERVICE_TYPE || operation == TAL_LOOK_UP_REPORTER ||
         operation == TAL_LOOK_UP_ALL_REPORTERS;
}

bool isAboutASession(tal_operation operation) {
  return operation != TAL_SEND_MESSAGE && operation != TAL_KILL_SERVICE && !isLookUp(operation);
}

bool isDoneWhenWritten(tal_operation operation) {
  return operation == TAL_START_SESSION || operation == TAL_KILL_SERVICE;
}

void count(std::atomic<std::uint64_t>& counter) { counter.fetch_add(1, std::memory_order_relaxed); }

}  // namespace

void Exchange::begin(std::uint64_t firstCall) {
  firstCall_ = firstCall;
  models_.setUp(
      [this](tal_operation operation, std::int64_t reporter, std::span<const unsigned char> arguments) {
        // The start stands for the program's, so the program is told when it is answered.
        if (operation == TAL_START_SESSION) addLateCall(firstCall_ + underWay_.size(), operation, reporter);
        sendOwn(operation, arguments);
      });
}

void Exchange::connectionBroke() {
  staged_ = outbox_.ring.released();
  underWay_.clear();
  doneWhenWritten_.clear();
  endStaged_ = false;
  lateCalls_.clear();
  lateCallsOfReporter_.clear();
}

void Exchange::stage() {
  RecordRing::Record record;
  while (stream_.unsent() < kStageBytes && !endStaged_ && outbox_.ring.peek(staged_, record)) {
    // What was done of a session is done again as long as it is not released: the models do not know of it
    // yet, and a new daemon even less.
    if (!record.done || (isAboutASession(record.operation) && !record.refused)) stageRecord(record);
    staged_ = record.next;
    everStaged_ = std::max(everStaged_, staged_);
  }
}

bool Exchange::hasMore() const {
  RecordRing::Record record;
  return !endStaged_ && outbox_.ring.peek(staged_, record);
}

void Exchange::stageRecord(const RecordRing::Record& record) {
  if (record.argumentBytes + kRequestHeadBytes > outbox_.maxFrameBytes.load(std::memory_order_relaxed)) {
    return refuse(record, localError(TAL_TOO_LARGE));
  }
  const std::uint64_t call = firstCall_ + underWay_.size();
  unsigned char* target = stream_.reserve(kFrameLengthBytes + kRequestHeadBytes + record.argumentBytes);
  const std::size_t head =
      writeRequestHead(target, record.operation, call, argumentCount(record.operation), record.argumentBytes);
  outbox_.ring.copyArguments(record, target + head);
  stream_.commit(head + record.argumentBytes);

  UnderWay request;
  request.record = record;
  request.operation = record.operation;
  request.argumentBytes = record.argumentBytes;
  // The program has been told of it already.
  request.own = record.done;
  if (isDoneWhenWritten(record.operation)) {
    request.done = true;
    if (!record.done) doneWhenWritten_.emplace_back(stream_.queuedBytes(), record);
    addLateCall(call, record.operation, outbox_.ring.head(record).reporter);
    endStaged_ = record.operation == TAL_KILL_SERVICE;
  }
  underWay_.push_back(std::move(request));
  if (record.operation == TAL_SEND_MESSAGE) {
    count(outbox_.counters.written);
    if (record.position < everStaged_) count(outbox_.counters.resent);
  }
}

void Exchange::sendOwn(tal_operation operation, std::span<const unsigned char> arguments,
                       std::function<void(bool failed)> answered) {
  if (arguments.size() + kRequestHeadBytes > outbox_.maxFrameBytes.load(std::memory_order_relaxed)) {
    return listener_.error(localError(TAL_TOO_LARGE));
  }
  UnderWay request;
  request.own = true;
  request.argumentBytes = arguments.size();
  request.operation = operation;
  request.done = operation == TAL_START_SESSION;
  request.answered = std::move(answered);
  unsigned char* target = stream_.reserve(kFrameLengthBytes + kRequestHeadBytes + arguments.size());
  const std::size_t head = writeRequestHead(target, operation, firstCall_ + underWay_.size(),
                                            argumentCount(operation), arguments.size());
  std::copy(arguments.begin(), arguments.end(), target + head);
  stream_.commit(head + arguments.size());
  underWay_.push_back(std::move(request));
}

void Exchange::noteWritten() {
  while (!doneWhenWritten_.empty() && doneWhenWritten_.front().first <= stream_.sentBytes()) {
    outbox_.ring.markDone(doneWhenWritten_.front().second, false);
    doneWhenWritten_.pop_front();
    if (doneWhenWritten_.empty()) endStaged_ = false;
  }
}

void Exchange::handle(const Reply& reply) {
  if (const auto late = lateCalls_.find(reply.call); late != lateCalls_.end()) {
    // Kept: the start of a test session is answered twice.
    return tell(late->second.operation, {late->second.reporter, 0}, reply.failed ? &reply.error : nullptr);
  }
  if (reply.call == 0 && reply.failed) {
    if (reply.error.code == kFrameSizeCode && reply.error.domain == kIpcDomain) refuseLongest(reply.error);
    return listener_.error(reply.error);
  }
  const std::uint64_t index = reply.call - firstCall_;
  if (reply.call < firstCall_ || index >= underWay_.size() || underWay_[index].done) {
    return count(outbox_.counters.ignoredReplies);
  }
  finish(underWay_[index], reply);
}

void Exchange::finish(UnderWay& request, const Reply& reply) {
  request.done = true;
  const tal_error* error = reply.failed ? &reply.error : nullptr;
  if (request.own) {
    if (error) listener_.error(*error);
    if (request.answered) request.answered(reply.failed);
    return;
  }
  const RecordHead head = outbox_.ring.head(request.record);
  outbox_.ring.markDone(request.record, reply.failed);
  if (isLookUp(request.operation)) return answerLookUp(head, request.operation, reply);
  if (request.operation == TAL_SEND_MESSAGE) {
    count(error ? outbox_.counters.refused : outbox_.counters.answered);
  }
  tell(request.operation, head, error);
}

void Exchange::refuse(const RecordRing::Record& record, const tal_error& why) {
  const RecordHead head = outbox_.ring.head(record);
  outbox_.ring.markDone(record, true);
  if (record.operation == TAL_SEND_MESSAGE) count(outbox_.counters.refused);
  tell(record.operation, head, &why);
}

void Exchange::refuseLongest(const tal_error& why) {
  UnderWay* longest = nullptr;
  for (UnderWay& request : underWay_) {
    if (request.done || isLookUp(request.operation)) continue;
    if (!longest || request.argumentBytes > longest->argumentBytes) longest = &request;
  }
  if (!longest) return;
  outbox_.maxFrameBytes.store(longest->argumentBytes + kRequestHeadBytes - 1, std::memory_order_relaxed);
  longest->done = true;
  if (!longest->own) refuse(longest->record, why);
}

void Exchange::tell(tal_operation operation, const RecordHead& head, const tal_error* error) {
  if (!listener_.wantsReplies()) return;
  tal_reply reply{};
  reply.operation = operation;
  reply.reporter_id = head.reporter;
  reply.tag = operation == TAL_SEND_MESSAGE ? head.tag : 0;
  reply.error = error;
  listener_.reply(reply);
}

void Exchange::answerLookUp(const RecordHead& head, tal_operation operation, const Reply& reply) {
  const std::unique_ptr<LookUp> lookUp(std::bit_cast<LookUp*>(head.tag));
  tal_reply answer{};
  answer.operation = operation;
  answer.reporter_id = head.reporter;
  tal_error error{};
  if (reply.failed) {
    answer.error = &reply.error;
  } else if (operation == TAL_LOOK_UP_SERVICE_TYPE && reply.result == Reply::Result::Number) {
    answer.service_type = static_cast<std::uint16_t>(reply.number);
  } else if (operation == TAL_LOOK_UP_REPORTER && reply.result == Reply::Result::Map) {
    answer.service_type = static_cast<std::uint16_t>(reply.serviceType);
    answer.valid_id = reply.reporterId;
  } else if (operation == TAL_LOOK_UP_ALL_REPORTERS && reply.result == Reply::Result::Reporters) {
    answer.reporters = reply.reporters.data();
    answer.reporter_count = reply.reporters.size();
  } else {
    error = makeError(TAL_INVALID, 0, kClientDomain, "the answer has another shape than the question");
    answer.error = &error;
  }
  lookUp->function(lookUp->user, &answer);
}

void Exchange::addLateCall(std::uint64_t call, tal_operation operation, std::int64_t reporter) {
  lateCalls_.emplace(call, LateCall{operation, reporter});
  auto& calls = lateCallsOfReporter_[reporter];
  calls.push_back(call);
  if (calls.size() > kLateCallsPerReporter) {
    lateCalls_.erase(calls.front());
    calls.erase(calls.begin());
  }
}

void Exchange::forgetLateCalls(std::int64_t reporter) {
  const auto calls = lateCallsOfReporter_.find(reporter);
  if (calls == lateCallsOfReporter_.end()) return;
  for (const std::uint64_t call : calls->second) lateCalls_.erase(call);
  lateCallsOfReporter_.erase(calls);
}

void Exchange::release() {
  while (!underWay_.empty() && underWay_.front().done) {
    underWay_.pop_front();
    ++firstCall_;
  }
  RecordRing& ring = outbox_.ring;
  RecordRing::Record record;
  while (ring.released() < staged_ && ring.peek(ring.released(), record) && record.done) {
    if (!record.refused) applyToModels(record);
    ring.release(record);
  }
}

void Exchange::applyToModels(const RecordRing::Record& record) {
  if (!isAboutASession(record.operation)) return;
  const RecordHead head = outbox_.ring.head(record);
  scratch_.resize(record.argumentBytes);
  outbox_.ring.copyArguments(record, scratch_.data());
  if (record.operation == TAL_DESTROY_SESSION) forgetLateCalls(head.reporter);
  models_.apply(record.operation, head.reporter, head.tag, scratch_);
}

void Exchange::abandon() {
  RecordRing& ring = outbox_.ring;
  RecordRing::Record record;
  Reply closed;
  closed.failed = true;
  closed.error = localError(TAL_CLOSED);
  for (auto position = ring.released(); position < ring.reserved(); position = record.next) {
    // A message whose send was under way when the connection was closed is about to be published.
    while (!ring.peek(position, record)) std::this_thread::yield();
    if (record.done || !isLookUp(record.operation)) continue;
    ring.markDone(record, true);
    answerLookUp(ring.head(record), record.operation, closed);
  }
}

}  // namespace tal::clientlib
