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
}};

/// Makes an empty store unless there is a file. It is built under another name
/// and moved into place, so that a start cut short leaves no half-made store.
/// Throws StoreError.
void createStoreIfMissing(const std::filesystem::path& path);

/// Refuses what is no store of this program or of a newer one, and brings an
/// older one up to date. Changes nothing that it refuses. Throws StoreError.
void checkAndMigrateStore(SqliteConnection& connection);

}  // namespace tal
