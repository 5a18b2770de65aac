#include "platform/linux/store/StoreSchema.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <system_error>

namespace tal {

namespace {

// "TALr": tells a store from every other SQLite file.
constexpr std::int64_t kApplicationId = 0x54414C72;

// Each entry brings a store from the version that is its index to the next one.
// Entries are never changed once released, only added.
constexpr std::array<const char*, 2> kMigrations{
    "CREATE TABLE events(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, name TEXT NOT NULL,"
    " payload TEXT NOT NULL);"
    "CREATE TABLE metrics(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, metric INTEGER NOT NULL,"
    " record BLOB NOT NULL);"
    "CREATE TABLE energylog(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, class INTEGER NOT NULL,"
    " name TEXT NOT NULL, payload TEXT NOT NULL);",

    // Messages name their session by its row, which can go once it has ended and
    // no message up to its last one is left. The outbox numbers messages for good:
    // AUTOINCREMENT never uses a number twice, and survives what the row itself
    // survives. `position` sums the sizes up, so that the outbox's size is the
    // difference of two rows.
    "CREATE TABLE rtc_sessions(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL,"
    " session_identifier INTEGER NOT NULL, realtime INTEGER NOT NULL, session_info TEXT NOT NULL,"
    " user_info TEXT NOT NULL, last_row INTEGER, last_number INTEGER);"
    "CREATE INDEX rtc_sessions_over ON rtc_sessions(last_row) WHERE last_row IS NOT NULL;"
    "CREATE TABLE rtc_rows(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, session INTEGER NOT NULL,"
    " category INTEGER NOT NULL, type INTEGER NOT NULL, payload TEXT NOT NULL);"
    "CREATE VIEW rtc_messages AS SELECT r.id, r.recorded_at, s.session_identifier, r.category, r.type,"
    " s.realtime, s.session_info, s.user_info, r.payload FROM rtc_rows r LEFT JOIN rtc_sessions s"
    " ON s.id = r.session;"
    "CREATE TABLE rtc_outbox(id INTEGER PRIMARY KEY AUTOINCREMENT, recorded_at REAL NOT NULL,"
    " session INTEGER NOT NULL, category INTEGER NOT NULL, type INTEGER NOT NULL, payload TEXT NOT NULL,"
    " position INTEGER NOT NULL);"
    "CREATE TABLE rtc_brokers(broker TEXT PRIMARY KEY, confirmed INTEGER NOT NULL) WITHOUT ROWID;"};
constexpr auto kVersion = static_cast<std::int64_t>(kMigrations.size());

[[noreturn]] void failWithErrno(const std::string& what) {
  throw StoreError(StoreError::Cause::kLasting, what + ": " + std::generic_category().message(errno));
}

void migrateFrom(SqliteConnection& connection, std::int64_t version) {
  connection.execute("BEGIN IMMEDIATE");
  for (std::int64_t step = version; step < kVersion; ++step) {
    connection.execute(kMigrations[static_cast<std::size_t>(step)]);
  }
  connection.execute("PRAGMA user_version=" + std::to_string(kVersion));
  connection.execute("COMMIT");
}

// Everything that belongs to the file for good. Larger pages make the tree of
// large rows flatter; giving pages back must be chosen before the first table.
void build(const std::filesystem::path& path) {
  SqliteConnection connection(path);
  // First, so that nothing waits for the disk: the file is made durable once,
  // when it is whole.
  connection.execute("PRAGMA synchronous=OFF; PRAGMA journal_mode=MEMORY");
  connection.execute("PRAGMA page_size=8192; PRAGMA auto_vacuum=INCREMENTAL");
  connection.execute("PRAGMA application_id=" + std::to_string(kApplicationId));
  migrateFrom(connection, 0);
  connection.execute("PRAGMA journal_mode=WAL");
}

}  // namespace

void createStoreIfMissing(const std::filesystem::path& path) {
  constexpr mode_t kOwnerAndGroup = 0640;  // SQLite gives the files beside it the same
  struct stat status {};
  const bool exists = ::stat(path.c_str(), &status) == 0;
  if (!exists && errno != ENOENT) failWithErrno("cannot look at the file");
  if (exists && status.st_size > 0) return;

  const std::string unfinished = path.string() + ".new";
  ::unlink(unfinished.c_str());
  // Logs of a store that somebody removed must not be taken for the new one's.
  for (const char* suffix : {"-wal", "-shm", "-journal"}) ::unlink((path.string() + suffix).c_str());
  const int file = ::open(unfinished.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, kOwnerAndGroup);
  if (file < 0) failWithErrno("cannot make the file");
  const bool permitted = ::fchmod(file, kOwnerAndGroup) == 0;
  if (permitted) build(unfinished);
  const bool durable = permitted && ::fsync(file) == 0;
  const int error = errno;
  ::close(file);
  errno = error;
  if (!durable) failWithErrno("cannot make the file");
  if (::rename(unfinished.c_str(), path.c_str()) != 0) failWithErrno("cannot move the new file into place");
}

void checkAndMigrateStore(SqliteConnection& connection) {
  if (connection.integer("PRAGMA application_id") != kApplicationId) {
    throw StoreError(StoreError::Cause::kLasting, "it is a database of another program");
  }
  const std::int64_t version = connection.integer("PRAGMA user_version");
  if (version > kVersion) {
    throw StoreError(StoreError::Cause::kLasting, "it was written by a newer version of this program");
  }
  if (version < kVersion) migrateFrom(connection, version);
}

}  // namespace tal
