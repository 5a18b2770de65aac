#pragma once

// The requests of one read from a socket: the unit in which work is handed from
// the I/O thread to the reporting queue, so that a wake-up is paid per batch.

#include <cstddef>
#include <optional>
#include <vector>

#include "wire/Request.h"

namespace tal {

/// Used again and again, so that requests keep the memory of their vectors. One
/// thread at a time.
class RequestBatch {
 public:
  struct Entry {
    Request request;
    /// Set where the frame was refused: the error is answered in its turn.
    std::optional<RequestError> error;
  };

  /// A fresh entry; valid until the next one is added.
  Entry& add() {
    if (count_ == entries_.size()) entries_.emplace_back();
    Entry& entry = entries_[count_++];
    entry.error.reset();
    return entry;
  }

  std::size_t size() const { return count_; }
  Entry& operator[](std::size_t index) { return entries_[index]; }

  /// The bytes of the frames that the requests came in.
  std::size_t bytes() const { return bytes_; }
  void addBytes(std::size_t count) { bytes_ += count; }

  void clear() {
    count_ = 0;
    bytes_ = 0;
    if (entries_.size() > kMostKeptEntries) {
      entries_.resize(kMostKeptEntries);
      entries_.shrink_to_fit();
    }
  }

 private:
  // What a full slice of ordinary messages needs; one that is full of tiny
  // requests does not leave its entries behind for ever.
  static constexpr std::size_t kMostKeptEntries = 256;

  std::vector<Entry> entries_;
  std::size_t count_ = 0;
  std::size_t bytes_ = 0;
};

}  // namespace tal
