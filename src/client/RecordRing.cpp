// The bounded queue between the threads that send and the library's thread.
#include "client/RecordRing.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstring>
#include <new>

namespace tal::clientlib {

namespace {

/// A header word is 0 while its record is being written, which is why room is cleared when it is released.
/// Else it holds the number of bytes of the arguments, the operation, and flags.
constexpr std::uint64_t kPublished = std::uint64_t{1} << 63;
constexpr std::uint64_t kDone = std::uint64_t{1} << 62;
constexpr std::uint64_t kRefused = std::uint64_t{1} << 61;
constexpr unsigned kOperationShift = 32;
constexpr std::uint64_t kOperationMask = 0xFF;
constexpr std::uint64_t kSizeMask = 0xFFFFFFFF;
constexpr std::size_t kHeaderBytes = sizeof(std::uint64_t);

/// Records begin at multiples of a header word, so that a header is never split by the end of the ring.
std::size_t sizeInRing(std::size_t argumentBytes) {
  const std::size_t bytes = kHeaderBytes + sizeof(RecordHead) + argumentBytes;
  return (bytes + kHeaderBytes - 1) & ~(kHeaderBytes - 1);
}

}  // namespace

RecordRing::RecordRing(std::size_t bytes) : mask_(bytes - 1) {
  void* memory =
      mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
  if (memory == MAP_FAILED) throw std::bad_alloc();
  bytes_ = static_cast<unsigned char*>(memory);
}

RecordRing::~RecordRing() { munmap(bytes_, capacity()); }

std::size_t RecordRing::argumentBytes(const RecordParts& parts) {
  return parts.arguments[0].size() + parts.arguments[1].size() + parts.arguments[2].size();
}

std::size_t RecordRing::recordBytes(const RecordParts& parts) { return sizeInRing(argumentBytes(parts)); }

bool RecordRing::push(std::span<const RecordParts> records, std::size_t leaveFree) {
  std::size_t needed = 0;
  for (const RecordParts& parts : records) needed += recordBytes(parts);
  // The word behind the newest record must not be the header of the oldest: the consumer takes it for the
  // next one.
  leaveFree = std::max(leaveFree, kHeaderBytes);
  Position start = reserved_.load(std::memory_order_relaxed);
  do {
    // A stale `released_` only makes the ring look fuller than it is; a stale `start` makes the exchange
    // fail.
    const Position used = start - released_.load(std::memory_order_acquire);
    if (used + needed + leaveFree > capacity()) return false;
  } while (!reserved_.compare_exchange_weak(start, start + needed, std::memory_order_seq_cst,
                                            std::memory_order_relaxed));
  // The first record is published last: as long as it is not, the consumer sees none of them.
  Position end = start + needed;
  for (std::size_t i = records.size(); i-- > 0;) {
    end -= recordBytes(records[i]);
    fill(end, records[i]);
  }
  return true;
}

void RecordRing::fill(Position position, const RecordParts& parts) {
  Position at = position + kHeaderBytes;
  copyIn(at, &parts.head, sizeof parts.head);
  at += sizeof parts.head;
  for (const auto& piece : parts.arguments) {
    copyIn(at, piece.data(), piece.size());
    at += piece.size();
  }
  // Sequentially consistent, so that either the consumer sees the record before it sleeps or the producer
  // sees that the consumer sleeps.
  headerAt(position).store(
      kPublished | static_cast<std::uint64_t>(parts.operation) << kOperationShift | argumentBytes(parts),
      std::memory_order_seq_cst);
}

bool RecordRing::peek(Position position, Record& record) const {
  const std::uint64_t header = headerAt(position).load(std::memory_order_seq_cst);
  if (header == 0) return false;
  record.position = position;
  record.operation = static_cast<tal_operation>(header >> kOperationShift & kOperationMask);
  record.done = (header & kDone) != 0;
  record.refused = (header & kRefused) != 0;
  record.argumentBytes = header & kSizeMask;
  record.next = position + sizeInRing(record.argumentBytes);
  return true;
}

RecordHead RecordRing::head(const Record& record) const {
  RecordHead head;
  copyOut(record.position + kHeaderBytes, &head, sizeof head);
  return head;
}

void RecordRing::copyArguments(const Record& record, unsigned char* target) const {
  copyOut(record.position + kHeaderBytes + sizeof(RecordHead), target, record.argumentBytes);
}

void RecordRing::markDone(const Record& record, bool refused) {
  headerAt(record.position).fetch_or(refused ? kDone | kRefused : kDone, std::memory_order_relaxed);
}

void RecordRing::release(const Record& record) {
  clear(record.position, record.next);
  released_.store(record.next, std::memory_order_release);
}

std::atomic_ref<std::uint64_t> RecordRing::headerAt(Position position) const {
  return std::atomic_ref<std::uint64_t>(*reinterpret_cast<std::uint64_t*>(bytes_ + (position & mask_)));
}

void RecordRing::copyIn(Position position, const void* source, std::size_t bytes) {
  if (bytes == 0) return;
  const std::size_t at = position & mask_;
  const std::size_t first = std::min(bytes, capacity() - at);
  std::memcpy(bytes_ + at, source, first);
  if (first < bytes) {
    std::memcpy(bytes_, static_cast<const unsigned char*>(source) + first, bytes - first);
  }
}

void RecordRing::copyOut(Position position, void* target, std::size_t bytes) const {
  if (bytes == 0) return;
  const std::size_t at = position & mask_;
  const std::size_t first = std::min(bytes, capacity() - at);
  std::memcpy(target, bytes_ + at, first);
  if (first < bytes) std::memcpy(static_cast<unsigned char*>(target) + first, bytes_, bytes - first);
}

void RecordRing::clear(Position from, Position to) {
  const std::size_t at = from & mask_;
  const std::size_t bytes = to - from;
  const std::size_t first = std::min(bytes, capacity() - at);
  std::memset(bytes_ + at, 0, first);
  std::memset(bytes_, 0, bytes - first);
}

}  // namespace tal::clientlib
