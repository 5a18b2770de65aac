#include "platform/linux/store/SqliteConnection.h"

#include <sqlite3.h>

#include <chrono>

namespace tal {

namespace {

// Readers never block the writer; this is for another program that writes or
// rebuilds the file. Longer waits are left to the writer's retries.
constexpr std::chrono::milliseconds kWaitForOthers{250};

bool isPassing(int code) { return code == SQLITE_FULL || code == SQLITE_BUSY || code == SQLITE_LOCKED; }

}  // namespace

SqliteConnection::SqliteConnection(const std::filesystem::path& path, Access access) {
  // One thread at a time: its own locks are not needed.
  const int flags =
      (access == Access::kReadOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE) | SQLITE_OPEN_NOMUTEX;
  if (sqlite3_open_v2(path.c_str(), &handle_, flags, nullptr) != SQLITE_OK) {
    const std::string reason = handle_ ? sqlite3_errmsg(handle_) : "out of memory";
    sqlite3_close(handle_);
    throw StoreError(StoreError::Cause::kLasting, reason);
  }
  sqlite3_extended_result_codes(handle_, 1);
  sqlite3_busy_timeout(handle_, static_cast<int>(kWaitForOthers.count()));
}

SqliteConnection::~SqliteConnection() { sqlite3_close(handle_); }

void SqliteConnection::fail() const {
  constexpr int kPrimaryCode = 0xFF;
  const int code = sqlite3_errcode(handle_) & kPrimaryCode;
  throw StoreError(isPassing(code) ? StoreError::Cause::kPassing : StoreError::Cause::kLasting,
                   sqlite3_errmsg(handle_));
}

void SqliteConnection::execute(const char* sql) {
  if (sqlite3_exec(handle_, sql, nullptr, nullptr, nullptr) != SQLITE_OK) fail();
}

std::int64_t SqliteConnection::integer(const char* sql) {
  SqliteStatement statement(*this, sql);
  return statement.step() ? statement.integerAt(0) : 0;
}

std::string SqliteConnection::text(const char* sql) {
  SqliteStatement statement(*this, sql);
  return statement.step() ? std::string(statement.textAt(0)) : std::string();
}

std::int64_t SqliteConnection::changedRows() const { return sqlite3_changes64(handle_); }

void SqliteConnection::rollBack() noexcept {
  if (!sqlite3_get_autocommit(handle_)) sqlite3_exec(handle_, "ROLLBACK", nullptr, nullptr, nullptr);
}

SqliteStatement::SqliteStatement(SqliteConnection& connection, std::string_view sql)
    : connection_(connection) {
  check(sqlite3_prepare_v3(connection.handle(), sql.data(), static_cast<int>(sql.size()),
                           SQLITE_PREPARE_PERSISTENT, &statement_, nullptr));
}

SqliteStatement::~SqliteStatement() { sqlite3_finalize(statement_); }

void SqliteStatement::check(int result) const {
  if (result != SQLITE_OK) connection_.fail();
}

int SqliteStatement::parameterCount() const { return sqlite3_bind_parameter_count(statement_); }

void SqliteStatement::bind(int index, double value) { check(sqlite3_bind_double(statement_, index, value)); }

void SqliteStatement::bind(int index, std::int64_t value) {
  check(sqlite3_bind_int64(statement_, index, value));
}

void SqliteStatement::bindText(int index, std::string_view value) {
  // A null pointer would store NULL.
  const char* const text = value.empty() ? "" : value.data();
  check(sqlite3_bind_text64(statement_, index, text, value.size(), SQLITE_STATIC, SQLITE_UTF8));
}

void SqliteStatement::bindBlob(int index, std::string_view value) {
  const char* const bytes = value.empty() ? "" : value.data();
  check(sqlite3_bind_blob64(statement_, index, bytes, value.size(), SQLITE_STATIC));
}

void SqliteStatement::run() {
  if (step()) reset();
}

bool SqliteStatement::step() {
  const int result = sqlite3_step(statement_);
  if (result == SQLITE_ROW) return true;
  if (result == SQLITE_DONE) {
    reset();
    return false;
  }
  try {
    connection_.fail();
  } catch (const StoreError&) {
    reset();  // only now: it takes the error's text with it
    throw;
  }
}

std::int64_t SqliteStatement::integerAt(int column) const { return sqlite3_column_int64(statement_, column); }

double SqliteStatement::doubleAt(int column) const { return sqlite3_column_double(statement_, column); }

std::string_view SqliteStatement::textAt(int column) const {
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column));
  return text ? std::string_view(text, static_cast<std::size_t>(sqlite3_column_bytes(statement_, column)))
              : std::string_view();
}

void SqliteStatement::reset() { sqlite3_reset(statement_); }

}  // namespace tal
