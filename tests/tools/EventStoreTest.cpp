#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "tools/StoreFile.h"
#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/EventStore.h"
#include "tools/talctl/StoreWatch.h"

namespace tal::talctl {
namespace {

using testing::ElementsAre;

class EventStoreOfFive : public testing::Test {
 protected:
  EventStoreOfFive() {
    store_file_.add(10, "a.Playback.Start");
    store_file_.add(20, "a.Playback.Stop");
    store_file_.add(15, "b.Record.Start");  // the clock was set back
    store_file_.add(30, "a.Playback.Start");
    store_file_.add(40, "[odd]*");
  }

  std::vector<std::int64_t> ids(const EventQuery& query) {
    std::vector<std::int64_t> found;
    EventStore(path_).forEach(query, [&](const StoredEvent& event) { found.push_back(event.id); });
    return found;
  }

  const test::TemporaryDirectory directory_;
  const std::filesystem::path path_ = directory_.path() / "store.db";
  StoreFile store_file_{path_};
};

TEST_F(EventStoreOfFive, AnswersQueriesOldestFirst) {
  EXPECT_THAT(ids({}), ElementsAre(1, 2, 3, 4, 5));
  EXPECT_THAT(ids({.newest = 2}), ElementsAre(4, 5));
  EXPECT_THAT(ids({.newest = 0}), ElementsAre());
  EXPECT_THAT(ids({.recorded_since = 20}), ElementsAre(2, 4, 5));
  EXPECT_THAT(ids({.after_id = 2, .up_to_id = 4}), ElementsAre(3, 4));
  EXPECT_THAT(ids({.name_glob = "a.*", .newest = 2}), ElementsAre(2, 4)) << "the newest of those that match";
  EXPECT_EQ(EventStore(path_).newestId(), 5);
}

TEST_F(EventStoreOfFive, MatchesWholeNamesByGlob) {
  EXPECT_THAT(ids({.name_glob = "*.Playback.*"}), ElementsAre(1, 2, 4));
  EXPECT_THAT(ids({.name_glob = "?.Record.Start"}), ElementsAre(3));
  EXPECT_THAT(ids({.name_glob = "[b-z].*"}), ElementsAre(3));
  EXPECT_THAT(ids({.name_glob = "Playback"}), ElementsAre());
  EXPECT_THAT(ids({.name_glob = "*.playback.*"}), ElementsAre());
  EXPECT_THAT(ids({.name_glob = "[[]odd][*]"}), ElementsAre(5));
  EXPECT_THAT(ids({.name_glob = "' OR 1 --"}), ElementsAre());
}

TEST_F(EventStoreOfFive, SeesCommitsOfAStoreFileThatGoesOn) {
  EventStore store(path_);
  EXPECT_EQ(store.newestId(), 5);
  store_file_.add(50, "later");
  EXPECT_EQ(store.newestId(), 6);
  EXPECT_TRUE(store.isCurrent());
  std::filesystem::rename(path_, directory_.path() / "elsewhere.db");
  EXPECT_FALSE(store.isCurrent());
}

TEST(EventStore, NeedsAFileButNoTable) {
  const test::TemporaryDirectory directory;
  const auto path = directory.path() / "a?b#c%41.db";  // characters that mean something in a URI
  EXPECT_THROW(EventStore{path}, CommandFailure);
  EXPECT_FALSE(std::filesystem::exists(path)) << "reading made a store";

  StoreFile(path).execute("DROP TABLE events");
  EventStore store(path);
  EXPECT_EQ(store.newestId(), 0);
  store.forEach({}, [](const StoredEvent&) { ADD_FAILURE(); });
}

constexpr int kNobody = -1;  // a descriptor that poll passes over
constexpr std::chrono::seconds kPatience{60};

TEST(StoreWatch, IsWokenByACommit) {
  const test::TemporaryDirectory directory;
  StoreFile file(directory.path() / "store.db");
  StoreWatch watch(directory.path() / "store.db");
  EXPECT_EQ(watch.wait(std::chrono::milliseconds(0), kNobody), StoreWatch::Woken::kTimedOut);
  file.add(1, "a");
  EXPECT_EQ(watch.wait(kPatience, kNobody), StoreWatch::Woken::kWritten);
  EXPECT_EQ(watch.wait(std::chrono::milliseconds(0), kNobody), StoreWatch::Woken::kTimedOut);
}

TEST(StoreWatch, IsNotWokenByReaders) {
  const test::TemporaryDirectory directory;
  const auto path = directory.path() / "store.db";
  StoreFile file(path);
  file.add(1, "a");
  StoreWatch watch(path);
  EXPECT_EQ(EventStore(path).newestId(), 1);
  EXPECT_EQ(watch.wait(std::chrono::milliseconds(0), kNobody), StoreWatch::Woken::kTimedOut);
}

TEST(StoreWatch, FollowsDirectoriesThatComeAndGo) {
  const test::TemporaryDirectory directory;
  const auto state = directory.path() / "deep" / "state";
  StoreWatch watch(state / "store.db");
  const auto expectWoken = [&] { EXPECT_EQ(watch.wait(kPatience, kNobody), StoreWatch::Woken::kWritten); };
  for (int round = 0; round < 2; ++round) {
    std::filesystem::create_directories(state);
    expectWoken();
    {
      StoreFile file(state / "store.db");
      expectWoken();
    }
    std::filesystem::remove_all(directory.path() / "deep");
    expectWoken();
    // The notices of the removal can come in several parts.
    while (watch.wait(std::chrono::milliseconds(0), kNobody) == StoreWatch::Woken::kWritten) {
    }
  }
}

TEST(RecheckSchedule, DoublesAndThenRests) {
  RecheckSchedule schedule;
  EXPECT_EQ(schedule.take(), std::nullopt);
  schedule.restart();
  std::chrono::milliseconds total{0};
  std::chrono::milliseconds last{0};
  int looks = 0;
  while (const auto pause = schedule.take()) {
    EXPECT_TRUE(looks == 0 || *pause == 2 * last);
    last = *pause;
    total += last;
    ASSERT_LT(++looks, 20);
  }
  EXPECT_GE(total, std::chrono::seconds(10)) << "a slow disk's commit would be missed";
  EXPECT_EQ(schedule.take(), std::nullopt);
}

}  // namespace
}  // namespace tal::talctl
