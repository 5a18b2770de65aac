#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tal {

/// What a row is written to. More may follow; the order is that of `kStoreTables`
/// in StoreSchema.h. The first are the tables that grow, whose oldest rows are
/// deleted in time; the others keep the books of the real-time messages.
enum class StoreTable : std::uint8_t {
  kEvents,
  kMetrics,
  kEnergylog,
  kRtcMessages,
  kRtcOutbox,
  kRtcSessions,     ///< A session whose messages follow.
  kRtcSessionEnds,  ///< No more messages of the sessions `number` to `detail`.
  kRtcBrokerJoins,  ///< The broker `name` wants what is in the outbox from now on,
                    ///< or from where the others are.
  kRtcBrokerLeaves,
  kRtcConfirmed,  ///< The broker `name` has everything up to the message `number`.
};
inline constexpr std::size_t kStoreTableCount = 10;
inline constexpr std::size_t kGrowingTableCount = 5;

/// One row, as it is handed over; refers to the texts.
struct StoreRow {
  StoreTable table = StoreTable::kEvents;
  double recorded_at = 0;         ///< Seconds since 1970.
  std::int64_t number = 0;        ///< `metric`, `class` or the session; events have none.
  std::int64_t detail = 0;        ///< Of real-time rows: `rtcKind`, or as their table says.
  std::string_view name = {};     ///< UTF-8; metrics have none.
  std::string_view payload = {};  ///< JSON text, or the bytes of a metrics record.
};

/// A message's category and type as one `detail`.
constexpr std::int64_t rtcKind(std::uint16_t category, std::uint16_t type) {
  return std::int64_t{category} << 16 | type;
}

/// Rows by their sequence numbers, both ends included.
struct RowRange {
  std::uint64_t first = 0;
  std::uint64_t last = 0;
  bool operator==(const RowRange&) const = default;
};

}  // namespace tal
