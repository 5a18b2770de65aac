// The bounded queue between the threads that send and the library's thread.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>

#include "client/talreporting.h"

namespace tal::clientlib {

/// What stands before the arguments of every record.
struct RecordHead {
  std::int64_t reporter = 0;
  /// A message's tag, a service type, or the owner of a look-up's answer: the operation tells.
  std::uint64_t tag = 0;
};

/// One request as it is put into the ring: a head, and arguments in up to three pieces of CBOR.
struct RecordParts {
  tal_operation operation = TAL_SEND_MESSAGE;
  RecordHead head;
  std::span<const unsigned char> arguments[3];
};

/// A ring of bytes with many producers and one consumer. A producer reserves room with one compare-and-swap,
/// copies its record and publishes it by writing the record's header word; it waits for nobody. The consumer
/// reads the records in the order of reservation, and gives back their room in the same order, whenever it is
/// done with them: what was read and not released can be read again.
///
/// A producer that is interrupted between reserving and publishing holds up the consumer, but no other
/// producer before the ring is full.
// NOLINTNEXTLINE(clang-analyzer-optin.performance.Padding): the padding is the point.
class RecordRing {
 public:
  /// Positions count bytes since the start; they never wrap.
  using Position = std::uint64_t;

  /// `bytes` is a power of two. Throws std::bad_alloc. All pages are resident afterwards, so that a producer
  /// takes no page fault.
  explicit RecordRing(std::size_t bytes);
  ~RecordRing();
  RecordRing(const RecordRing&) = delete;
  RecordRing& operator=(const RecordRing&) = delete;

  // Any thread.

  /// Puts the records in without a gap between them, all or none. `leaveFree` bytes must remain free after
  /// it.
  bool push(std::span<const RecordParts> records, std::size_t leaveFree);
  bool push(const RecordParts& record, std::size_t leaveFree) { return push({&record, 1}, leaveFree); }
  std::size_t capacity() const { return mask_ + 1; }
  Position reserved() const { return reserved_.load(std::memory_order_seq_cst); }
  Position released() const { return released_.load(std::memory_order_acquire); }

  // The consumer's thread.

  /// A published record, where it lies.
  struct Record {
    Position position;
    Position next;
    tal_operation operation;
    bool done;
    /// Done and answered with an error: without effect.
    bool refused;
    std::size_t argumentBytes;
  };
  /// The record at `position`; false when none is published there yet.
  bool peek(Position position, Record& record) const;
  RecordHead head(const Record& record) const;
  /// Copies the arguments of a record to `target`.
  void copyArguments(const Record& record, unsigned char* target) const;
  /// Marks a record as one that need not be read again.
  void markDone(const Record& record, bool refused);
  /// Gives back the room up to the end of `record`, which is the oldest one.
  void release(const Record& record);

  static std::size_t argumentBytes(const RecordParts& parts);
  /// Room that a record takes.
  static std::size_t recordBytes(const RecordParts& parts);

 private:
  std::atomic_ref<std::uint64_t> headerAt(Position position) const;
  void copyIn(Position position, const void* source, std::size_t bytes);
  void copyOut(Position position, void* target, std::size_t bytes) const;
  void clear(Position from, Position to);
  void fill(Position position, const RecordParts& parts);

  std::size_t mask_;
  unsigned char* bytes_;
  /// On lines of their own: producers write the one, the consumer the other.
  alignas(64) std::atomic<Position> reserved_{0};
  alignas(64) std::atomic<Position> released_{0};
};

}  // namespace tal::clientlib
