#pragma once

#include <array>
#include <filesystem>
#include <memory>
#include <optional>
#include <vector>

#include "platform/linux/store/Retention.h"
#include "platform/linux/store/SqliteConnection.h"
#include "platform/linux/store/StoreRow.h"
#include "platform/linux/store/StoreSchema.h"

namespace tal {

/// The store's file, open for writing. One thread at a time. Everything throws
/// StoreError; a transaction that failed must be rolled back.
class StoreDatabase {
 public:
  /// Makes the file where there is none; its directory exists.
  explicit StoreDatabase(const std::filesystem::path& path);

  /// Full: a commit is on the disk when it returns. Otherwise only checkpoints
  /// wait for the disk, and a power loss can cost the last commits.
  void setFullySynchronous(bool full);

  void begin() { begin_.run(); }
  void insert(const StoreRow& row);
  void commit() { commit_.run(); }
  void rollBack() noexcept { connection_.rollBack(); }

  /// What decides about retention; `now` in seconds since 1970. The spans stay
  /// valid until the next call.
  RetentionState retentionState(double now);

  /// Carries one step out. Within a transaction.
  void carryOut(const RetentionStep& step);

 private:
  struct TableStatements {
    TableStatements(SqliteConnection& connection, const StoreTableSchema& table);
    SqliteStatement insert;
    SqliteStatement first;
    SqliteStatement last_id;
    SqliteStatement remove;
    SqliteStatement remove_older;
  };
  TableStatements& statementsOf(StoreTable table) { return *tables_[static_cast<std::size_t>(table)]; }
  std::optional<TableSpan> spanOf(StoreTable table);

  SqliteConnection connection_;
  std::int64_t page_bytes_;
  std::vector<std::unique_ptr<TableStatements>> tables_;
  SqliteStatement begin_;
  SqliteStatement commit_;
  SqliteStatement page_count_;
  SqliteStatement free_count_;
  std::vector<TableSpan> spans_;
};

}  // namespace tal
