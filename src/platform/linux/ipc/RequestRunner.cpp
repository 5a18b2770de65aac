#include "platform/linux/ipc/RequestRunner.h"

#include <utility>

namespace tal {

namespace {

// Replies are sent at the end of a turn, or before when they have grown to this.
constexpr std::size_t kReplyBytesSentAtOnce = std::size_t{64} << 10;

// One that is filled, one that waits, one that is carried out.
constexpr std::size_t kMostSpareBatches = 3;

}  // namespace

RequestRunner::RequestRunner(std::shared_ptr<TalReportingClientServerInstance> client, RunnerContext& context,
                             std::shared_ptr<ReplyChannel> channel, Hooks hooks)
    : client_(std::move(client)), context_(context), channel_(std::move(channel)), hooks_(std::move(hooks)) {}

std::unique_ptr<RequestBatch> RequestRunner::takeBatch() {
  {
    const std::lock_guard lock(mutex_);
    if (!spare_.empty()) {
      auto batch = std::move(spare_.back());
      spare_.pop_back();
      return batch;
    }
  }
  return std::make_unique<RequestBatch>();
}

bool RequestRunner::submit(std::unique_ptr<RequestBatch> batch) {
  const std::lock_guard lock(mutex_);
  waiting_requests_ += batch->size();
  waiting_bytes_ += batch->bytes();
  waiting_.push_back(std::move(batch));
  schedule();
  reader_waits_ = waiting_requests_ >= kMostWaitingRequests || waiting_bytes_ >= kMostWaitingBytes;
  return !reader_waits_;
}

void RequestRunner::endInput() {
  const std::lock_guard lock(mutex_);
  input_ended_ = true;
  schedule();
}

void RequestRunner::resume() {
  const std::lock_guard lock(mutex_);
  room_came_ = true;
  resting_ = false;
  schedule();
}

// With the mutex held.
void RequestRunner::schedule() {
  if (scheduled_ || resting_) return;
  scheduled_ = true;
  context_.queue.post([self = shared_from_this()] { self->run(); });
}

void RequestRunner::run() {
  running_ = true;
  bool rests = false;
  {
    const std::lock_guard lock(mutex_);
    room_came_ = false;
  }
  for (std::size_t carried_out = 0; carried_out < kMostRequestsPerTurn && nextBatch(); ++carried_out) {
    if (context_.killed.load(std::memory_order_relaxed)) return;
    carryOut((*batch_)[position_++]);
    if (position_ == batch_->size()) finishBatch();
    if (replies_.size() >= kReplyBytesSentAtOnce && !sendReplies()) {
      rests = true;
      break;
    }
  }
  if (std::exchange(holds_new_, false)) context_.durable_replies.gate().commitSoon();
  rests = !sendReplies() || rests;
  running_ = false;
  finishTurn(rests);
}

// False when nothing waits.
bool RequestRunner::nextBatch() {
  while (!batch_) {
    const std::lock_guard lock(mutex_);
    if (waiting_.empty()) return false;
    batch_ = std::move(waiting_.front());
    waiting_.pop_front();
    position_ = 0;
  }
  return true;
}

void RequestRunner::finishBatch() {
  bool has_room = false;
  {
    const std::lock_guard lock(mutex_);
    waiting_requests_ -= batch_->size();
    waiting_bytes_ -= batch_->bytes();
    batch_->clear();
    if (spare_.size() < kMostSpareBatches) spare_.push_back(std::move(batch_));
    batch_.reset();
    if (reader_waits_ && waiting_requests_ < kMostWaitingRequests && waiting_bytes_ < kMostWaitingBytes) {
      reader_waits_ = false;
      has_room = true;
    }
  }
  if (has_room) hooks_.has_room();
}

void RequestRunner::finishTurn(bool rests) {
  bool all_carried_out = false;
  {
    const std::lock_guard lock(mutex_);
    scheduled_ = false;
    if (batch_ || !waiting_.empty()) {
      // Room that came during the turn has been told of already.
      resting_ = rests && !room_came_;
      schedule();
    } else {
      all_carried_out = input_ended_;
    }
  }
  if (!all_carried_out) return;
  if (!std::exchange(told_carried_out_, true)) hooks_.carried_out();
  tellIfSettled();
}

void RequestRunner::tellIfSettled() {
  if (told_carried_out_ && held_.empty() && !std::exchange(told_settled_, true)) hooks_.settled();
}

bool RequestRunner::sendReplies() { return channel_->send(replies_); }

}  // namespace tal
