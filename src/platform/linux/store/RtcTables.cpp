#include "platform/linux/store/RtcTables.h"

#include <utility>

namespace tal {

// A session's last message has at most the ids that were noted at its end.
RtcTables::RtcTables(SqliteConnection& connection)
    : connection_(connection),
      drop_confirmed_(connection,
                      "DELETE FROM rtc_outbox WHERE id <= (SELECT min(confirmed) FROM rtc_brokers)"),
      drop_sessions_(connection,
                     "DELETE FROM rtc_sessions"
                     " WHERE last_row < coalesce((SELECT min(id) FROM rtc_rows), last_row + 1)"
                     " AND last_number < coalesce((SELECT min(id) FROM rtc_outbox), last_number + 1)"),
      // What the first message itself takes does not count.
      span_(connection,
            "SELECT coalesce((SELECT position FROM rtc_outbox ORDER BY id DESC LIMIT 1)"
            " - (SELECT position FROM rtc_outbox ORDER BY id LIMIT 1), 0)"),
      trim_(connection,
            "DELETE FROM rtc_outbox WHERE id < (SELECT id FROM rtc_outbox ORDER BY id LIMIT 1) + 250"
            " AND position < (SELECT position FROM rtc_outbox ORDER BY id LIMIT 1) + ?1") {}

void RtcTables::dropConfirmed() {
  drop_confirmed_.run();
  if (connection_.changedRows() > 0) dropUnusedSessions();
}

std::int64_t RtcTables::outboxOverhang(std::int64_t most_bytes) {
  const std::int64_t bytes = span_.step() ? span_.integerAt(0) : 0;
  span_.reset();
  return bytes - most_bytes;
}

void RtcTables::trimOutbox(std::int64_t most_bytes) {
  trim_.bind(1, outboxOverhang(most_bytes));
  trim_.run();
  noteLosses(connection_.changedRows());
  dropUnusedSessions();
}

std::int64_t RtcTables::takeLosses() { return std::exchange(losses_, 0); }

}  // namespace tal
