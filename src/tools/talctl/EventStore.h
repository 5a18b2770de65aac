#pragma once

// The analytics events of a store, read beside the daemon that writes them.

#include <sys/types.h>

#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

struct sqlite3;
struct sqlite3_stmt;

namespace tal::talctl {

/// The texts are the store's own: they last as long as the call that shows them.
struct StoredEvent {
  std::int64_t id;
  double recorded_at;  ///< Seconds since 1970.
  std::string_view name;
  std::string_view payload;  ///< JSON, an object.
};

/// Which events; all conditions hold together.
struct EventQuery {
  std::optional<std::string> name_glob = {};  ///< *, ? and [a-z], the whole name, case counts.
  std::optional<double> recorded_since = {};  ///< Seconds since 1970.
  std::optional<std::uint64_t> newest = {};   ///< No more than so many, the latest ones.
  std::int64_t after_id = 0;
  std::optional<std::int64_t> up_to_id = {};
};

/// A store opened for reading only: nothing here changes it or holds up the
/// daemon. One thread. Every function throws CommandFailure when SQLite fails.
class EventStore {
 public:
  /// `path` must exist.
  explicit EventStore(std::filesystem::path path);

  /// The newest event's ID; 0 where there is none, or no table for them yet.
  std::int64_t newestId();

  /// The oldest event's ID; 0 where there is none.
  std::int64_t oldestId();

  /// Calls `function` for every such event, the oldest first.
  void forEach(const EventQuery& query, const std::function<void(const StoredEvent&)>& function);

  /// False once the path names another file than was opened, or none.
  bool isCurrent() const;

 private:
  struct CloseDatabase {
    void operator()(sqlite3* database) const;
  };
  struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const;
  };
  using Database = std::unique_ptr<sqlite3, CloseDatabase>;
  using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

  Database open(bool immutable) const;
  bool hasEvents();
  /// What the query finds; 0 without events.
  std::int64_t idFrom(const std::string& sql);
  Statement prepare(const std::string& sql);
  /// True for a row, false at the end.
  bool step(const Statement& statement);
  [[noreturn]] void fail(sqlite3* database) const;

  std::filesystem::path path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
  Database database_;
};

}  // namespace tal::talctl
