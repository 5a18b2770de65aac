#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <string>

#include "platform/linux/process/StartupError.h"
#include "platform/linux/store/StoreCommitter.h"
#include "platform/store/StoreFixture.h"

namespace tal {
namespace {

using std::chrono_literals::operator""ms;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::ThrowsMessage;

constexpr double kSecondsPerDay = 86400;

class StoreCommitterTest : public test::StoreFixture {
 protected:
  StoreCommitter open() {
    return StoreCommitter(
        {.directory = directory_.path(), .settings = settings_, .clock = clock_, .log = log_.service});
  }
  static std::vector<RowChunk> batchOf(int count, const StoreRow& row) {
    std::vector<RowChunk> batch;
    batch.emplace_back(static_cast<std::size_t>(count) * RowChunk::sizeOf(row), 1);
    for (int i = 0; i < count; ++i) batch.back().append(row);
    return batch;
  }
  static void maintain(StoreCommitter& committer) {
    while (committer.maintenanceIsDue()) committer.maintainForAMoment();
  }
  void expectRefused(std::string_view why) {
    const std::string before = test::readFile(storePath());
    EXPECT_THAT([&] { open(); },
                ThrowsMessage<StartupError>(testing::AllOf(HasSubstr(why), HasSubstr(storePath().string()))));
    EXPECT_EQ(test::readFile(storePath()), before);
  }
  mode_t modeOf(const std::string& suffix) const {
    struct stat status {};
    EXPECT_EQ(::stat((storePath().string() + suffix).c_str(), &status), 0) << suffix;
    return status.st_mode & 07777U;
  }
};

TEST_F(StoreCommitterTest, RowsStandInTheirTablesForEveryReader) {
  StoreCommitter committer = open();
  std::vector<RowChunk> batch;
  batch.emplace_back(1000, 1);
  batch.back().append(
      {.table = StoreTable::kEvents, .recorded_at = 1.5, .number = 0, .name = "a.b", .payload = "{\"é\":1}"});
  batch.back().append({.table = StoreTable::kMetrics,
                       .recorded_at = 2,
                       .number = -4,
                       .name = {},
                       .payload = std::string_view("\0\xff", 2)});
  batch.back().append(
      {.table = StoreTable::kEnergylog, .recorded_at = 3, .number = 9, .name = {}, .payload = {}});
  ASSERT_TRUE(committer.commit(batch, {}));
  test::OtherProgram reader(storePath());
  EXPECT_THAT(reader.query("SELECT id, recorded_at, name, payload, typeof(payload) FROM events"),
              ElementsAre("1|1.5|a.b|{\"é\":1}|text"));
  EXPECT_THAT(reader.query("SELECT id, recorded_at, metric, hex(record), typeof(record) FROM metrics"),
              ElementsAre("1|2.0|-4|00FF|blob"));
  EXPECT_THAT(reader.query("SELECT id, recorded_at, class, name, payload FROM energylog"),
              ElementsAre("1|3.0|9||"));
  EXPECT_THAT(reader.query("PRAGMA journal_mode"), ElementsAre("wal"));
}

TEST_F(StoreCommitterTest, FilesAreTheOwnersAndTheGroupsOnly) {
  const mode_t before = ::umask(0077);
  StoreCommitter committer = open();
  ::umask(before);
  ASSERT_TRUE(committer.commit(batchOf(1, event("")), {}));
  for (const char* suffix : {"", "-wal", "-shm"}) EXPECT_EQ(modeOf(suffix), 0640U) << suffix;
}

TEST_F(StoreCommitterTest, AStoreIsFoundAgainWithItsRowsAndGoesOnCounting) {
  ASSERT_TRUE(open().commit(batchOf(2, event("first")), {}));
  ASSERT_TRUE(open().commit(batchOf(1, event("second")), {}));
  EXPECT_THAT(test::OtherProgram(storePath()).query("SELECT id, payload FROM events ORDER BY id"),
              ElementsAre("1|first", "2|first", "3|second"));
}

TEST_F(StoreCommitterTest, AnUnfinishedOrEmptyFileIsNoObstacle) {
  test::writeFile(storePath().string() + ".new", "cut short");
  test::writeFile(storePath(), "");
  EXPECT_TRUE(open().commit(batchOf(1, event("")), {}));
}

TEST_F(StoreCommitterTest, ForeignAndDamagedFilesAreRefusedAndLeftAlone) {
  test::writeFile(storePath(), "Dear diary, this is no database.");
  expectRefused("not a database");
  std::filesystem::remove(storePath());
  test::OtherProgram(storePath()).query("CREATE TABLE events(id)");
  expectRefused("a database of another program");
  std::filesystem::remove(storePath());
  { open(); }
  test::OtherProgram(storePath()).query("PRAGMA user_version=1000");
  expectRefused("newer version");
}

TEST_F(StoreCommitterTest, AFileThatWasCutShortIsRefused) {
  {
    StoreCommitter committer = open();
    const std::string payload(5000, 'x');
    ASSERT_TRUE(committer.commit(batchOf(500, event(payload)), {}));
  }
  std::filesystem::resize_file(storePath(), std::filesystem::file_size(storePath()) / 2);
  expectRefused("malformed");
}

TEST_F(StoreCommitterTest, OldRowsGoAndTheFileShrinks) {
  StoreCommitter committer = open();
  setLimit("retain_days", 2);
  const std::string payload(5000, 'x');
  const double now = clock_.secondsSince1970();
  ASSERT_TRUE(committer.commit(batchOf(2000, event(payload, now)), {}));
  ASSERT_TRUE(committer.commit(batchOf(10, event("young", now + 2 * kSecondsPerDay)), {}));
  clock_.setWallClock(now + 2 * kSecondsPerDay);
  maintain(committer);
  test::OtherProgram reader(storePath());
  EXPECT_EQ(reader.number("SELECT count(*) FROM events"), 2010) << "at the age";
  clock_.setWallClock(now + 2 * kSecondsPerDay + 1);
  ASSERT_TRUE(committer.commit(batchOf(1, event("youngest", now + 2 * kSecondsPerDay)), {}));
  clock_.advance(400ms);
  maintain(committer);
  EXPECT_EQ(reader.number("SELECT count(*) FROM events"), 11);
  EXPECT_LT(reader.number("PRAGMA page_count") * reader.number("PRAGMA page_size"), 5'000'000);
}

TEST_F(StoreCommitterTest, TheFileStaysNearItsSizeAndTheOldestRowsOfAllTablesGo) {
  StoreCommitter committer = open();
  setLimit("max_mebibytes", 4);
  constexpr int kBatches = 60;
  constexpr int kRowsPerBatch = 500;
  constexpr std::uintmax_t kNearBytes = std::uintmax_t{5} * 1024 * 1024;
  const std::string payload(400, 'x');
  StoreRow row = event(payload);
  for (int i = 0; i < kBatches; ++i) {
    row.recorded_at = clock_.secondsSince1970() + i;
    row.table = i % 2 == 0 ? StoreTable::kEvents : StoreTable::kEnergylog;
    ASSERT_TRUE(committer.commit(batchOf(kRowsPerBatch, row), {}));
    clock_.advance(400ms);
    maintain(committer);
    ASSERT_LT(std::filesystem::file_size(storePath()), kNearBytes);
  }
  test::OtherProgram reader(storePath());
  const double last = clock_.secondsSince1970();
  EXPECT_GT(reader.number("SELECT count(*) FROM events"), 2000);
  EXPECT_GT(reader.number("SELECT count(*) FROM energylog"), 2000);
  // Both tables reach back equally far: neither was spared.
  const std::string oldest =
      "SELECT (SELECT min(recorded_at) FROM events) - (SELECT min(recorded_at) FROM energylog)";
  EXPECT_LE(std::abs(reader.number(oldest)), 1);
  EXPECT_GT(last, 0);
}

TEST_F(StoreCommitterTest, SettingsThatMakeNoSenseAreLoggedOnceAndTheDefaultStands) {
  setLimit("retain_days", 0);
  setLimit("max_mebibytes", "many");
  setLimit("synchronous", "sometimes");
  StoreCommitter committer = open();
  for (int i = 0; i < 3; ++i) {
    ASSERT_TRUE(committer.commit(batchOf(1, event("", clock_.secondsSince1970())), {}));
    clock_.advance(400ms);
    maintain(committer);
  }
  EXPECT_EQ(lines_.count("retain_days max_mebibytes synchronous not usable"), 1U);
  EXPECT_EQ(test::OtherProgram(storePath()).number("SELECT count(*) FROM events"), 3);
}

TEST_F(StoreCommitterTest, RefusedCommitsLeaveNothingAndAreLoggedOncePerMinute) {
  StoreCommitter committer = open();
  test::OtherProgram other(storePath());
  other.query("BEGIN IMMEDIATE");
  EXPECT_FALSE(committer.commit(batchOf(1, event("held up")), {}));
  EXPECT_FALSE(committer.commit(batchOf(1, event("held up")), {}));
  EXPECT_EQ(lines_.count("cannot write the store"), 1U);
  EXPECT_GT(committer.pauseBeforeRetry(), 0ms);
  clock_.advance(std::chrono::minutes(1));
  EXPECT_FALSE(committer.commit(batchOf(1, event("held up")), {}));
  EXPECT_EQ(lines_.count("cannot write the store"), 2U);
  other.query("ROLLBACK");
  EXPECT_TRUE(committer.commit(batchOf(1, event("stored")), {.rows = 7, .since = 0, .until = 1.5}));
  EXPECT_EQ(committer.pauseBeforeRetry(), 0ms);
  EXPECT_EQ(lines_.count("is written again"), 1U);
  EXPECT_THAT(
      other.query("SELECT name, payload FROM events"),
      ElementsAre("org.vantle.talsys.store.RowsGivenUp|{\"rows\":7,\"since\":\"1970-01-01T00:00:00.000000Z\","
                  "\"until\":\"1970-01-01T00:00:01.500000Z\"}",
                  "e|stored"));
}

TEST(DiskTroubleTest, PausesGrowToAnEnd) {
  EXPECT_EQ(retryPause(0), 0ms);
  EXPECT_EQ(retryPause(1), 100ms);
  EXPECT_EQ(retryPause(2), 200ms);
  EXPECT_EQ(retryPause(6), 3200ms);
  EXPECT_EQ(retryPause(7), 5000ms);
  EXPECT_EQ(retryPause(1000), 5000ms);
}

}  // namespace
}  // namespace tal
