#include "platform/linux/store/RowQueue.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace tal {

namespace {

// Enough for a steady stream; what a burst needed beyond that is freed.
constexpr std::size_t kMostSpareChunks = 16;
// One outage of the disk makes few ranges; older ones are joined.
constexpr std::size_t kMostGivenUpRanges = 64;

}  // namespace

std::uint64_t RowQueue::append(const StoreRow& row) {
  const std::size_t size = RowChunk::sizeOf(row);
  if (size > bounds_.most_bytes) return refuse();
  const bool follows = !waiting_.empty() && waiting_.back().range().last == last_;
  if (!follows || !waiting_.back().hasRoomFor(row)) addChunkFor(row);
  waiting_.back().append(row);
  return ++last_;
}

std::uint64_t RowQueue::refuse() {
  ++last_;
  noteGivenUp({last_, last_});
  return last_;
}

void RowQueue::addChunkFor(const StoreRow& row) {
  const std::size_t capacity = std::max(bounds_.chunk_bytes, RowChunk::sizeOf(row));
  while (bytes_ + capacity > bounds_.most_bytes && !waiting_.empty()) giveUpOldest();
  if (capacity == bounds_.chunk_bytes && !spare_.empty()) {
    waiting_.push_back(std::move(spare_.back()));
    spare_.pop_back();
    waiting_.back().reuse(last_ + 1);
  } else {
    waiting_.emplace_back(capacity, last_ + 1);
  }
  bytes_ += capacity;
}

std::vector<RowChunk> RowQueue::take(std::size_t about_bytes) {
  std::vector<RowChunk> taken;
  std::size_t taken_bytes = 0;
  while (!waiting_.empty() && (taken.empty() || taken_bytes + waiting_.front().capacity() <= about_bytes)) {
    taken_bytes += waiting_.front().capacity();
    taken.push_back(std::move(waiting_.front()));
    waiting_.pop_front();
  }
  first_taken_ = taken.empty() ? 0 : taken.front().range().first;
  return taken;
}

void RowQueue::finish(std::vector<RowChunk> taken) {
  first_taken_ = 0;
  for (RowChunk& chunk : taken) recycle(std::move(chunk));
}

void RowQueue::putBack(std::vector<RowChunk> taken) {
  first_taken_ = 0;
  waiting_.insert(waiting_.begin(), std::make_move_iterator(taken.begin()),
                  std::make_move_iterator(taken.end()));
}

void RowQueue::giveUpAll() {
  while (!waiting_.empty()) giveUpOldest();
}

void RowQueue::giveUpOldest() {
  noteGivenUp(waiting_.front().range());
  recycle(std::move(waiting_.front()));
  waiting_.pop_front();
}

void RowQueue::noteGivenUp(RowRange rows) {
  given_up_count_ += rows.last - rows.first + 1;
  const auto behind = std::find_if(given_up_.begin(), given_up_.end(),
                                   [&](const RowRange& range) { return range.first > rows.first; });
  if (behind != given_up_.begin() && std::prev(behind)->last + 1 == rows.first) {
    std::prev(behind)->last = rows.last;
  } else {
    given_up_.insert(behind, rows);
  }
  if (given_up_.size() > kMostGivenUpRanges) {
    given_up_[1].first = given_up_[0].first;
    given_up_.pop_front();
  }
}

void RowQueue::recycle(RowChunk chunk) {
  bytes_ -= chunk.capacity();
  if (chunk.capacity() == bounds_.chunk_bytes && spare_.size() < kMostSpareChunks)
    spare_.push_back(std::move(chunk));
}

std::uint64_t RowQueue::settledThrough() const {
  if (first_taken_ != 0) return first_taken_ - 1;
  if (!waiting_.empty()) return waiting_.front().range().first - 1;
  return last_;
}

bool RowQueue::wasGivenUp(RowRange rows) const {
  return std::any_of(given_up_.begin(), given_up_.end(), [rows](const RowRange& range) {
    return range.first <= rows.last && rows.first <= range.last;
  });
}

}  // namespace tal
