#include "tools/talctl/EventStore.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <string_view>
#include <utility>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

// A reader waits only while the store is being recovered after a crash.
constexpr int kBusyTimeoutMs = 5000;

std::string asUri(std::string_view path) {
  std::string uri = "file:";
  for (const char c : path) {
    switch (c) {
      case '%':
        uri += "%25";
        break;
      case '?':
        uri += "%3f";
        break;
      case '#':
        uri += "%23";
        break;
      default:
        uri += c;
    }
  }
  return uri;
}

std::string_view columnText(sqlite3_stmt* statement, int column) {
  const auto* text = static_cast<const char*>(sqlite3_column_blob(statement, column));
  const int bytes = sqlite3_column_bytes(statement, column);
  return text ? std::string_view(text, static_cast<std::size_t>(bytes)) : std::string_view();
}

}  // namespace

void EventStore::CloseDatabase::operator()(sqlite3* database) const { sqlite3_close(database); }
void EventStore::FinalizeStatement::operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }

EventStore::EventStore(std::filesystem::path path) : path_(std::move(path)) {
  struct stat status {};
  if (stat(path_.c_str(), &status) != 0) {
    throw CommandFailure("there is no store at " + path_.native() + ": has the daemon ever run there?");
  }
  device_ = status.st_dev;
  inode_ = status.st_ino;
  database_ = open(false);
  // The file is opened for good by the first look into it. Where nobody has a store open, its index is made
  // anew, which takes the right to write to the directory; without it, and without a log of late commits,
  // the file by itself is whole.
  if (sqlite3_exec(database_.get(), "SELECT 1 FROM sqlite_master", nullptr, nullptr, nullptr) ==
          SQLITE_CANTOPEN &&
      !std::filesystem::exists(path_.native() + "-wal")) {
    database_ = open(true);
  }
}

EventStore::Database EventStore::open(bool immutable) const {
  const std::string uri = asUri(path_.native()) + (immutable ? "?immutable=1" : "");
  sqlite3* raw = nullptr;
  const int result = sqlite3_open_v2(uri.c_str(), &raw,
                                     SQLITE_OPEN_READONLY | SQLITE_OPEN_URI | SQLITE_OPEN_NOMUTEX, nullptr);
  Database database(raw);
  if (result != SQLITE_OK) fail(database.get());
  sqlite3_busy_timeout(database.get(), kBusyTimeoutMs);
  return database;
}

void EventStore::fail(sqlite3* database) const {
  throw CommandFailure("cannot read the store " + path_.native() + ": " + sqlite3_errmsg(database));
}

EventStore::Statement EventStore::prepare(const std::string& sql) {
  sqlite3_stmt* raw = nullptr;
  if (sqlite3_prepare_v2(database_.get(), sql.c_str(), -1, &raw, nullptr) != SQLITE_OK) fail(database_.get());
  return Statement(raw);
}

bool EventStore::step(const Statement& statement) {
  switch (sqlite3_step(statement.get())) {
    case SQLITE_ROW:
      return true;
    case SQLITE_DONE:
      return false;
    default:
      fail(database_.get());
  }
}

bool EventStore::hasEvents() { return step(prepare("SELECT 1 FROM sqlite_master WHERE name = 'events'")); }

std::int64_t EventStore::idFrom(const std::string& sql) {
  if (!hasEvents()) return 0;
  const Statement statement = prepare(sql);
  return step(statement) ? sqlite3_column_int64(statement.get(), 0) : 0;
}

std::int64_t EventStore::newestId() { return idFrom("SELECT max(id) FROM events"); }
std::int64_t EventStore::oldestId() { return idFrom("SELECT min(id) FROM events"); }

void EventStore::forEach(const EventQuery& query, const std::function<void(const StoredEvent&)>& function) {
  if (!hasEvents()) return;
  std::string sql = "SELECT id, recorded_at, name, payload FROM events WHERE id > ?1";
  if (query.up_to_id) sql += " AND id <= ?2";
  if (query.name_glob) sql += " AND name GLOB ?3";
  if (query.recorded_since) sql += " AND recorded_at >= ?4";
  sql += query.newest ? " ORDER BY id DESC LIMIT ?5" : " ORDER BY id";
  if (query.newest) sql = "SELECT * FROM (" + sql + ") ORDER BY id";

  const Statement statement = prepare(sql);
  sqlite3_stmt* const raw = statement.get();
  sqlite3_bind_int64(raw, 1, query.after_id);
  if (query.up_to_id) sqlite3_bind_int64(raw, 2, *query.up_to_id);
  if (query.name_glob) sqlite3_bind_text(raw, 3, query.name_glob->c_str(), -1, SQLITE_TRANSIENT);
  if (query.recorded_since) sqlite3_bind_double(raw, 4, *query.recorded_since);
  if (query.newest) sqlite3_bind_int64(raw, 5, static_cast<std::int64_t>(*query.newest));
  while (step(statement)) {
    function({.id = sqlite3_column_int64(raw, 0),
              .recorded_at = sqlite3_column_double(raw, 1),
              .name = columnText(raw, 2),
              .payload = columnText(raw, 3)});
  }
}

bool EventStore::isCurrent() const {
  struct stat status {};
  return stat(path_.c_str(), &status) == 0 && status.st_dev == device_ && status.st_ino == inode_;
}

}  // namespace tal::talctl
