#pragma once

// The little of SQLite that the store needs, with errors as exceptions and
// everything released by scope.

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "platform/linux/store/StoreError.h"

struct sqlite3;
struct sqlite3_stmt;

namespace tal {

/// One open database file. One thread at a time. Errors are StoreErrors.
class SqliteConnection {
 public:
  enum class Access { kReadWrite, kReadOnly };

  /// Opens a file that exists.
  explicit SqliteConnection(const std::filesystem::path& path, Access access = Access::kReadWrite);
  SqliteConnection(const SqliteConnection&) = delete;
  SqliteConnection& operator=(const SqliteConnection&) = delete;
  ~SqliteConnection();

  /// Runs one or more statements that answer nothing.
  void execute(const char* sql);
  void execute(const std::string& sql) { execute(sql.c_str()); }

  /// The first column of the statement's first row.
  std::int64_t integer(const char* sql);
  std::string text(const char* sql);

  /// How many rows the last statement that changes any has changed.
  std::int64_t changedRows() const;

  /// Ends a transaction that failed, if there is one.
  void rollBack() noexcept;

  sqlite3* handle() const { return handle_; }
  [[noreturn]] void fail() const;

 private:
  sqlite3* handle_ = nullptr;
};

/// A statement that is prepared once and run often. Its connection outlives it.
class SqliteStatement {
 public:
  SqliteStatement(SqliteConnection& connection, std::string_view sql);
  SqliteStatement(const SqliteStatement&) = delete;
  SqliteStatement& operator=(const SqliteStatement&) = delete;
  ~SqliteStatement();

  /// The highest parameter that the statement has.
  int parameterCount() const;

  /// Parameters count from 1. Texts and blobs must stay until the end of `run`.
  void bind(int index, double value);
  void bind(int index, std::int64_t value);
  void bindText(int index, std::string_view value);
  void bindBlob(int index, std::string_view value);

  /// Runs it to its end and makes it ready for the next time.
  void run();

  /// True while there is a row; columns count from 0. `reset` ends it early.
  bool step();
  std::int64_t integerAt(int column) const;
  double doubleAt(int column) const;
  std::string_view textAt(int column) const;
  void reset();

 private:
  void check(int result) const;

  SqliteConnection& connection_;
  sqlite3_stmt* statement_ = nullptr;
};

}  // namespace tal
