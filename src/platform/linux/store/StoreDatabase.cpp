#include "platform/linux/store/StoreDatabase.h"

#include <string>

namespace tal {

namespace {

// Pages worth keeping at hand: the right-hand edge of three trees, and what a
// slice of retention reads. An idle daemon is meant to be small.
constexpr int kCacheKibibytes = 1024;
// The log is moved into the file after this much: often enough to stay small,
// rarely enough that waiting for the disk twice is spread over many rows.
constexpr std::int64_t kLogBytes = 8 * 1024 * 1024;
constexpr int kPagesPerShrink = 256;

const std::filesystem::path& made(const std::filesystem::path& path) {
  createStoreIfMissing(path);
  return path;
}

// Binds what of the row the statement has a place for.
void bindRtc(SqliteStatement& statement, const StoreRow& row) {
  constexpr int kNumber = 2;
  constexpr int kName = 3;
  constexpr int kPayload = 4;
  constexpr int kDetail = 5;
  const int count = statement.parameterCount();
  if (count >= kNumber) statement.bind(kNumber, row.number);
  if (count >= kName) statement.bindText(kName, row.name);
  if (count >= kPayload) statement.bindText(kPayload, row.payload);
  if (count >= kDetail) statement.bind(kDetail, row.detail);
}

// Before any statement is prepared, so that a foreign file is refused as what it is.
SqliteConnection& checked(SqliteConnection& connection) {
  checkAndMigrateStore(connection);
  if (connection.text("PRAGMA journal_mode=WAL") != "wal") {
    throw StoreError(StoreError::Cause::kLasting, "its file system does not support a shared log");
  }
  return connection;
}

}  // namespace

StoreDatabase::TableStatements::TableStatements(SqliteConnection& connection, const StoreTableSchema& table)
    : first(connection, "SELECT id, recorded_at FROM " + std::string(table.name) + " ORDER BY id LIMIT 1"),
      last_id(connection, "SELECT max(id) FROM " + std::string(table.name)),
      remove(connection, "DELETE FROM " + std::string(table.name) + " WHERE id <= ?1"),
      remove_older(connection,
                   "DELETE FROM " + std::string(table.name) + " WHERE id <= ?1 AND recorded_at < ?2") {}

StoreDatabase::StoreDatabase(const std::filesystem::path& path)
    : connection_(made(path)),
      page_bytes_(checked(connection_).integer("PRAGMA page_size")),
      rtc_(connection_),
      begin_(connection_, "BEGIN IMMEDIATE"),
      commit_(connection_, "COMMIT"),
      page_count_(connection_, "PRAGMA page_count"),
      free_count_(connection_, "PRAGMA freelist_count") {
  connection_.execute("PRAGMA cache_size=-" + std::to_string(kCacheKibibytes));
  connection_.execute("PRAGMA wal_autocheckpoint=" + std::to_string(kLogBytes / page_bytes_));
  connection_.execute("PRAGMA journal_size_limit=" + std::to_string(kLogBytes));
  // Deleted rows need not be overwritten: they are no secrets from those who
  // may read the file.
  connection_.execute("PRAGMA secure_delete=OFF");
  setFullySynchronous(false);
  for (const StoreTableSchema& table : kStoreTables) {
    inserts_.push_back(std::make_unique<SqliteStatement>(connection_, table.insert));
  }
  for (std::size_t i = 0; i < kGrowingTableCount; ++i) {
    tables_.push_back(std::make_unique<TableStatements>(connection_, kStoreTables[i]));
  }
  // Touches both ends of every table, so that a file that was cut short is
  // noticed now.
  retentionState(0);
}

void StoreDatabase::setFullySynchronous(bool full) {
  connection_.execute(full ? "PRAGMA synchronous=FULL" : "PRAGMA synchronous=NORMAL");
}

void StoreDatabase::insert(const StoreRow& row) {
  SqliteStatement& statement = insertOf(row.table);
  statement.bind(1, row.recorded_at);
  if (row.table != StoreTable::kEvents) statement.bind(2, row.number);
  if (row.table >= StoreTable::kRtcMessages) {
    bindRtc(statement, row);
  } else if (row.table != StoreTable::kMetrics) {
    statement.bindText(3, row.name);
    statement.bindText(4, row.payload);
  } else {
    statement.bindBlob(4, row.payload);
  }
  statement.run();
  if (row.table == StoreTable::kRtcConfirmed) rtc_.dropConfirmed();
}

std::optional<TableSpan> StoreDatabase::spanOf(StoreTable table) {
  TableStatements& statements = statementsOf(table);
  TableSpan span{.table = table};
  if (!statements.first.step()) return std::nullopt;
  span.first_id = statements.first.integerAt(0);
  span.first_recorded_at = statements.first.doubleAt(1);
  statements.first.reset();
  if (statements.last_id.step()) span.last_id = statements.last_id.integerAt(0);
  statements.last_id.reset();
  return span;
}

RetentionState StoreDatabase::retentionState(double now) {
  spans_.clear();
  for (std::size_t i = 0; i < kGrowingTableCount; ++i) {
    if (const auto span = spanOf(static_cast<StoreTable>(i))) spans_.push_back(*span);
  }
  const auto count = [](SqliteStatement& statement) {
    const std::int64_t number = statement.step() ? statement.integerAt(0) : 0;
    statement.reset();
    return number;
  };
  const std::int64_t free = count(free_count_);
  return {.now = now,
          .used_bytes = (count(page_count_) - free) * page_bytes_,
          .free_bytes = free * page_bytes_,
          .log_bytes = kLogBytes,
          .tables = spans_};
}

void StoreDatabase::carryOut(const RetentionStep& step) {
  switch (step.action) {
    case RetentionStep::Action::kNothing:
      return;
    case RetentionStep::Action::kShrink:
      connection_.execute("PRAGMA incremental_vacuum(" + std::to_string(kPagesPerShrink) + ")");
      return;
    case RetentionStep::Action::kDelete:
      break;
  }
  TableStatements& statements = statementsOf(step.table);
  SqliteStatement& remove = step.recorded_before ? statements.remove_older : statements.remove;
  remove.bind(1, step.through_id);
  if (step.recorded_before) remove.bind(2, *step.recorded_before);
  remove.run();
  if (step.table == StoreTable::kRtcOutbox) rtc_.noteLosses(connection_.changedRows());
  if (step.table == StoreTable::kRtcOutbox || step.table == StoreTable::kRtcMessages) {
    rtc_.dropUnusedSessions();
  }
}

}  // namespace tal
