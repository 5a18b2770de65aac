#pragma once

#include <array>
#include <filesystem>
#include <string_view>

#include "platform/linux/store/SqliteConnection.h"
#include "platform/linux/store/StoreRow.h"

namespace tal {

/// How rows get into a table and out of it, in the order of StoreTable.
struct StoreTableSchema {
  std::string_view name;
  std::string_view insert;  ///< Binds as StoreDatabase::insert does it.
};
inline constexpr std::array<StoreTableSchema, kStoreTableCount> kStoreTables{{
    {"events", "INSERT INTO events(recorded_at, name, payload) VALUES(?1, ?3, ?4)"},
    {"metrics", "INSERT INTO metrics(recorded_at, metric, record) VALUES(?1, ?2, ?4)"},
    {"energylog", "INSERT INTO energylog(recorded_at, class, name, payload) VALUES(?1, ?2, ?3, ?4)"},
    {"rtc_rows",
     "INSERT INTO rtc_rows(recorded_at, session, category, type, payload)"
     " VALUES(?1, ?2, ?5 >> 16, ?5 & 65535, ?4)"},
    {"rtc_outbox",
     "INSERT INTO rtc_outbox(recorded_at, session, category, type, payload, position)"
     " SELECT ?1, ?2, ?5 >> 16, ?5 & 65535, ?4, length(CAST(?4 AS BLOB)) + 64 +"
     " coalesce((SELECT position FROM rtc_outbox ORDER BY id DESC LIMIT 1), 0)"},
    {"rtc_sessions",
     "INSERT INTO rtc_sessions(id, recorded_at, session_identifier, realtime, session_info, user_info)"
     " VALUES(?2, ?1, ?5, ?3 ->> '$.contains_real_time_events', ?3, ?4)"},
    {"rtc_sessions",
     "UPDATE rtc_sessions SET last_row = coalesce((SELECT max(id) FROM rtc_rows), 0),"
     " last_number = coalesce((SELECT seq FROM sqlite_sequence WHERE name = 'rtc_outbox'), 0)"
     " WHERE id BETWEEN ?2 AND ?5 AND last_row IS NULL"},
    {"rtc_brokers",
     "INSERT OR IGNORE INTO rtc_brokers(broker, confirmed) SELECT ?3,"
     " coalesce((SELECT min(confirmed) FROM rtc_brokers),"
     " (SELECT seq FROM sqlite_sequence WHERE name = 'rtc_outbox'), 0)"},
    {"rtc_brokers", "DELETE FROM rtc_brokers WHERE broker = ?3"},
    {"rtc_brokers", "UPDATE rtc_brokers SET confirmed = max(confirmed, ?2) WHERE broker = ?3"},
}};

/// Makes an empty store unless there is a file. It is built under another name
/// and moved into place, so that a start cut short leaves no half-made store.
/// Throws StoreError.
void createStoreIfMissing(const std::filesystem::path& path);

/// Refuses what is no store of this program or of a newer one, and brings an
/// older one up to date. Changes nothing that it refuses. Throws StoreError.
void checkAndMigrateStore(SqliteConnection& connection);

}  // namespace tal
