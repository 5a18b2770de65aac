#pragma once

#include <array>
#include <filesystem>
#include <memory>
#include <optional>
#include <vector>

#include "platform/linux/store/Retention.h"
#include "platform/linux/store/RtcTables.h"
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

  /// Whether the outbox is larger than this, and the deletion of a slice of its
  /// oldest messages; the latter within a transaction.
  bool outboxIsOver(std::int64_t most_bytes) { return rtc_.outboxIsOver(most_bytes); }
  void trimOutbox(std::int64_t most_bytes) { rtc_.trimOutbox(most_bytes); }

  /// How many messages were deleted from the outbox, since this was asked last,
  /// though a broker did not have them.
  std::int64_t takeOutboxLosses() { return rtc_.takeLosses(); }

 private:
  struct TableStatements {
    TableStatements(SqliteConnection& connection, const StoreTableSchema& table);
    SqliteStatement first;
    SqliteStatement last_id;
    SqliteStatement remove;
    SqliteStatement remove_older;
  };
  SqliteStatement& insertOf(StoreTable table) { return *inserts_[static_cast<std::size_t>(table)]; }
  TableStatements& statementsOf(StoreTable table) { return *tables_[static_cast<std::size_t>(table)]; }
  std::optional<TableSpan> spanOf(StoreTable table);

  SqliteConnection connection_;
  std::int64_t page_bytes_;
  std::vector<std::unique_ptr<SqliteStatement>> inserts_;
  std::vector<std::unique_ptr<TableStatements>> tables_;  // of those that grow
  RtcTables rtc_;
  SqliteStatement begin_;
  SqliteStatement commit_;
  SqliteStatement page_count_;
  SqliteStatement free_count_;
  std::vector<TableSpan> spans_;
};

}  // namespace tal
