#pragma once

// A store made by hand, for what reads one beside the daemon.

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <filesystem>
#include <string>

namespace tal::talctl {

/// A store as the daemon makes it, as far as events go.
class StoreFile {
 public:
  explicit StoreFile(const std::filesystem::path& path) {
    EXPECT_EQ(sqlite3_open(path.c_str(), &database_), SQLITE_OK);
    execute("PRAGMA journal_mode = WAL");
    execute(
        "CREATE TABLE IF NOT EXISTS events(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, "
        "name TEXT NOT NULL, payload TEXT NOT NULL)");
  }
  ~StoreFile() { sqlite3_close(database_); }
  StoreFile(const StoreFile&) = delete;
  StoreFile& operator=(const StoreFile&) = delete;

  void execute(const std::string& sql) {
    EXPECT_EQ(sqlite3_exec(database_, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK) << sql;
  }
  void add(double recorded_at, const std::string& name, const std::string& payload = "{}") {
    execute("INSERT INTO events(recorded_at, name, payload) VALUES (" + std::to_string(recorded_at) + ", '" +
            name + "', '" + payload + "')");
  }

 private:
  sqlite3* database_ = nullptr;
};

}  // namespace tal::talctl
