#pragma once

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <condition_variable>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "platform/HostFakes.h"
#include "platform/SettingsStore.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/store/StoreRow.h"

namespace tal::test {

/// Settings held in memory. Any thread.
class MapSettings final : public SettingsStore {
 public:
  std::optional<MessageValue> value(std::string_view domain, std::string_view key) const override {
    const std::lock_guard lock(mutex_);
    const auto found = values_.find(std::string(domain) + '/' + std::string(key));
    return found == values_.end() ? std::nullopt : std::optional(found->second);
  }
  bool setValue(std::string_view domain, std::string_view key, const MessageValue& value) override {
    const std::lock_guard lock(mutex_);
    values_.insert_or_assign(std::string(domain) + '/' + std::string(key), value);
    return true;
  }
  void refresh(std::string_view) override {}
  void clear() {
    const std::lock_guard lock(mutex_);
    values_.clear();
  }

 private:
  mutable std::mutex mutex_;
  std::map<std::string, MessageValue> values_;
};

/// A log that can be waited on.
class AwaitableLogSink final : public LogSink {
 public:
  void write(std::string_view, LogLevel, std::string_view line) override {
    const std::lock_guard lock(mutex_);
    lines_.emplace_back(line);
    changed_.notify_all();
  }
  /// Returns once there is a line with this text.
  void await(std::string_view text) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return countLocked(text) > 0; });
  }
  std::size_t count(std::string_view text) const {
    const std::lock_guard lock(mutex_);
    return countLocked(text);
  }

 private:
  std::size_t countLocked(std::string_view text) const {
    std::size_t count = 0;
    for (const std::string& line : lines_) count += line.find(text) != std::string::npos ? 1 : 0;
    return count;
  }

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::string> lines_;
};

/// Another program's connection to the store.
class OtherProgram {
 public:
  explicit OtherProgram(const std::filesystem::path& path) {
    EXPECT_EQ(sqlite3_open_v2(path.c_str(), &handle_, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr),
              SQLITE_OK);
    sqlite3_busy_timeout(handle_, 10000);
  }
  OtherProgram(const OtherProgram&) = delete;
  OtherProgram& operator=(const OtherProgram&) = delete;
  ~OtherProgram() { sqlite3_close(handle_); }

  /// Runs the statement; the result's cells, joined by "|", one text per row.
  std::vector<std::string> query(const std::string& sql) {
    std::vector<std::string> rows;
    sqlite3_stmt* statement = nullptr;
    EXPECT_EQ(sqlite3_prepare_v2(handle_, sql.c_str(), -1, &statement, nullptr), SQLITE_OK)
        << sqlite3_errmsg(handle_);
    int result = SQLITE_DONE;
    while ((result = sqlite3_step(statement)) == SQLITE_ROW) {
      std::string& row = rows.emplace_back();
      for (int column = 0; column < sqlite3_column_count(statement); ++column) {
        if (column > 0) row += '|';
        const void* cell = sqlite3_column_blob(statement, column);
        row.append(static_cast<const char*>(cell),
                   static_cast<std::size_t>(sqlite3_column_bytes(statement, column)));
      }
    }
    EXPECT_EQ(result, SQLITE_DONE) << sql << ": " << sqlite3_errmsg(handle_);
    sqlite3_finalize(statement);
    return rows;
  }
  long number(const std::string& sql) { return std::stol(query(sql).at(0)); }

 private:
  sqlite3* handle_ = nullptr;
};

class StoreFixture : public testing::Test {
 protected:
  // The time at which the clock stands at first: rows from 1970 would be too old to keep.
  static StoreRow event(std::string_view payload, double recorded_at = 1769870702.5) {
    return {.table = StoreTable::kEvents,
            .recorded_at = recorded_at,
            .number = 0,
            .name = "e",
            .payload = payload};
  }
  void setLimit(std::string_view key, const MessageValue& value) {
    settings_.setValue("org.vantle.talsys.store", key, value);
  }
  std::filesystem::path storePath() const { return directory_.path() / "store.db"; }

  TemporaryDirectory directory_;
  MapSettings settings_;
  StandingClock clock_;
  AwaitableLogSink lines_;
  LogChannels log_{&lines_};
};

}  // namespace tal::test
