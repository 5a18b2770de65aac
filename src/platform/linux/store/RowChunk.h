#pragma once

// Rows on their way to the writer thread, packed end to end: handing one over
// costs a copy of its bytes and no allocation.

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "platform/linux/store/ChunkMemory.h"
#include "platform/linux/store/StoreRow.h"

namespace tal {

/// Consecutive rows in one block of memory. One thread at a time.
class RowChunk {
 public:
  RowChunk(std::size_t capacity, std::uint64_t first_sequence) : bytes_(capacity), first_(first_sequence) {}

  /// What the row takes.
  static std::size_t sizeOf(const StoreRow& row) {
    return sizeof(Header) + row.name.size() + row.payload.size();
  }

  bool hasRoomFor(const StoreRow& row) const { return sizeOf(row) <= bytes_.size() - used_; }
  void append(const StoreRow& row);

  /// Empties it for rows from `first_sequence` on.
  void reuse(std::uint64_t first_sequence) {
    used_ = 0;
    count_ = 0;
    first_ = first_sequence;
  }

  std::size_t capacity() const { return bytes_.size(); }
  std::uint64_t count() const { return count_; }
  RowRange range() const { return {first_, first_ + count_ - 1}; }

  /// Calls `visit` with each row in turn; its texts are valid during the call
  /// and as long as the chunk is not changed.
  template <typename Visit>
  void forEach(Visit visit) const {
    for (std::size_t at = 0; at < used_;) {
      Header header;
      std::memcpy(&header, bytes_.get() + at, sizeof header);
      const char* const name = bytes_.get() + at + sizeof header;
      const char* const payload = name + header.name_size;
      visit(StoreRow{.table = header.table,
                     .recorded_at = header.recorded_at,
                     .number = header.number,
                     .detail = header.detail,
                     .name = {name, header.name_size},
                     .payload = {payload, header.payload_size}});
      at += sizeof header + header.name_size + header.payload_size;
    }
  }

 private:
  struct Header {
    double recorded_at;
    std::int64_t number;
    std::int64_t detail;
    std::uint32_t name_size;
    std::uint32_t payload_size;
    StoreTable table;
  };

  ChunkMemory bytes_;
  std::size_t used_ = 0;
  std::uint64_t count_ = 0;
  std::uint64_t first_;
};

inline void RowChunk::append(const StoreRow& row) {
  const Header header{.recorded_at = row.recorded_at,
                      .number = row.number,
                      .detail = row.detail,
                      .name_size = static_cast<std::uint32_t>(row.name.size()),
                      .payload_size = static_cast<std::uint32_t>(row.payload.size()),
                      .table = row.table};
  char* const to = bytes_.get() + used_;
  std::memcpy(to, &header, sizeof header);
  if (!row.name.empty()) std::memcpy(to + sizeof header, row.name.data(), row.name.size());
  if (!row.payload.empty())
    std::memcpy(to + sizeof header + row.name.size(), row.payload.data(), row.payload.size());
  used_ += sizeOf(row);
  ++count_;
}

}  // namespace tal
