#pragma once

// The rows between their producers and the writer thread, and what becomes of
// them when they are too many. Apart from threads, so that it can be tested.

#include <cstddef>
#include <cstdint>
#include <deque>
#include <vector>

#include "platform/linux/store/RowChunk.h"
#include "platform/linux/store/StoreRow.h"

namespace tal {

/// Rows in the order of their sequence numbers, which begin at 1. The owner's
/// mutex guards it.
///
/// A row is waiting; then it may be taken, and either comes back or is finished.
/// A waiting row may be given up instead. It is settled when it is finished or
/// given up, and so is every row before it.
class RowQueue {
 public:
  struct Bounds {
    /// Past this much, taken rows included, the oldest waiting ones are given up.
    std::size_t most_bytes = std::size_t{64} * 1024 * 1024;
    /// Rows share memory in pieces of this size; it is also the least that is given up.
    std::size_t chunk_bytes = std::size_t{64} * 1024;
  };

  RowQueue() : RowQueue(Bounds{}) {}
  explicit RowQueue(Bounds bounds) : bounds_(bounds) {}

  /// The row's sequence number. A row that exceeds the bound by itself is given
  /// up at once.
  std::uint64_t append(const StoreRow& row);

  /// The number of a row that is given up as it comes.
  std::uint64_t refuse();

  /// Takes the oldest waiting rows: at least one chunk, if any, and no more
  /// than `about_bytes` beyond that. Nothing else may be taken at the time.
  std::vector<RowChunk> take(std::size_t about_bytes);
  void finish(std::vector<RowChunk> taken);
  void putBack(std::vector<RowChunk> taken);

  /// Gives up everything that waits.
  void giveUpAll();

  bool hasWaiting() const { return !waiting_.empty(); }
  /// The memory of all rows that are not settled.
  std::size_t bytes() const { return bytes_; }
  std::uint64_t lastSequence() const { return last_; }
  std::uint64_t settledThrough() const;

  /// How many rows were given up in all.
  std::uint64_t givenUpCount() const { return given_up_count_; }
  /// True when one of the rows was given up. Far back, where many separate
  /// ranges were, rows between two of them count as well.
  bool wasGivenUp(RowRange rows) const;

 private:
  void giveUpOldest();
  void noteGivenUp(RowRange rows);
  void addChunkFor(const StoreRow& row);
  void recycle(RowChunk chunk);

  Bounds bounds_;
  std::deque<RowChunk> waiting_;
  std::vector<RowChunk> spare_;
  std::size_t bytes_ = 0;
  std::uint64_t last_ = 0;
  std::uint64_t first_taken_ = 0;  // 0: none is taken
  std::uint64_t given_up_count_ = 0;
  std::deque<RowRange> given_up_;
};

}  // namespace tal
