#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tal {

/// The tables that rows are written to. More may follow; the order is that of
/// `kStoreTables` in StoreSchema.h.
enum class StoreTable : std::uint8_t { kEvents, kMetrics, kEnergylog };
inline constexpr std::size_t kStoreTableCount = 3;

/// One row, as it is handed over; refers to the texts.
struct StoreRow {
  StoreTable table = StoreTable::kEvents;
  double recorded_at = 0;    ///< Seconds since 1970.
  std::int64_t number = 0;   ///< `metric` or `class`; events have none.
  std::string_view name;     ///< UTF-8; metrics have none.
  std::string_view payload;  ///< JSON text, or the bytes of a metrics record.
};

/// Rows by their sequence numbers, both ends included.
struct RowRange {
  std::uint64_t first = 0;
  std::uint64_t last = 0;
  bool operator==(const RowRange&) const = default;
};

}  // namespace tal
