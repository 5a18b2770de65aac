#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>
#include <future>
#include <memory>
#include <string>
#include <thread>

#include "platform/linux/store/StoreAnalyticsSink.h"
#include "platform/linux/store/StoreWriter.h"
#include "platform/store/StoreFixture.h"

namespace tal {
namespace {

using std::chrono_literals::operator""ms;
using std::chrono_literals::operator""min;
using testing::ElementsAre;

// Far beyond what any step takes: a test that waits this long hangs, and says so.
constexpr auto kPatience = 1min;

class StoreWriterTest : public test::StoreFixture {
 protected:
  std::unique_ptr<StoreWriter> open(RowQueue::Bounds bounds = {}) {
    return std::make_unique<StoreWriter>(
        StoreWriter::Dependencies{
            .directory = directory_.path(), .settings = settings_, .clock = clock_, .log = log_.service},
        bounds);
  }
  long storedEvents() {
    return test::OtherProgram(storePath()).number("SELECT count(*) FROM events WHERE name='e'");
  }
};

TEST_F(StoreWriterTest, ARowIsCommittedWithoutAnyoneAsking) {
  const auto store = open();
  std::promise<std::uint64_t> settled;
  store->observeProgress([&](std::uint64_t through) { settled.set_value(through); });
  EXPECT_EQ(store->append(event("one")), 1U);
  EXPECT_EQ(store->sequence(), 1U);
  EXPECT_EQ(settled.get_future().get(), 1U);
  EXPECT_EQ(storedEvents(), 1);
  store->observeProgress({});
}

TEST_F(StoreWriterTest, ProgressIsToldOnlyOfWhatAReaderCanSee) {
  constexpr std::uint64_t kRows = 20000;
  const auto store = open();
  std::promise<void> all_settled;
  std::uint64_t last = 0;
  store->observeProgress([&](std::uint64_t through) {
    EXPECT_GT(through, last);
    last = through;
    EXPECT_GE(storedEvents(), static_cast<long>(through));
    if (through == kRows) all_settled.set_value();
  });
  for (std::uint64_t row = 1; row <= kRows; ++row) {
    ASSERT_EQ(store->append(event("{}")), row);
    if (row % 100 == 0) store->requestCommit(row);
  }
  all_settled.get_future().wait();
  EXPECT_FALSE(store->wasGivenUp({1, kRows}));
  store->observeProgress({});
}

TEST_F(StoreWriterTest, RowsOfManyThreadsAreAllStored) {
  constexpr int kThreads = 4;
  constexpr int kRowsEach = 5000;
  auto store = open();
  {
    std::vector<std::jthread> producers;
    for (int i = 0; i < kThreads; ++i) {
      producers.emplace_back([&store, i] {
        const std::string payload = std::to_string(i);
        for (int row = 0; row < kRowsEach; ++row) store->requestCommit(store->append(event(payload)));
      });
    }
  }
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_THAT(test::OtherProgram(storePath()).query("SELECT payload, count(*) FROM events GROUP BY payload"),
              ElementsAre("0|5000", "1|5000", "2|5000", "3|5000"));
}

TEST_F(StoreWriterTest, ClosingCommitsWhatWaitsAndGivesUpWhatComesLater) {
  const auto store = open();
  for (int i = 0; i < 1000; ++i) store->append(event("before"));
  store->flushAndClose();
  EXPECT_EQ(storedEvents(), 1000);
  EXPECT_FALSE(std::filesystem::exists(storePath().string() + "-wal"));
  EXPECT_EQ(store->append(event("after")), 1001U);
  EXPECT_TRUE(store->wasGivenUp({1001, 1001}));
  EXPECT_EQ(store->settledThrough(), 1001U);
  EXPECT_TRUE(store->commitNow(0ms));
  store->append(event("after"));
  EXPECT_EQ(lines_.count("after the end of the store"), 1U);
  EXPECT_EQ(storedEvents(), 1000);
}

TEST_F(StoreWriterTest, ClosingEndsAlthoughRowsKeepComing) {
  const auto store = open();
  std::jthread flood([&](const std::stop_token& stop) {
    while (!stop.stop_requested()) store->append(event("flood"));
  });
  while (store->settledThrough() == 0) std::this_thread::yield();
  store->flushAndClose();
  flood.request_stop();
  flood.join();
  std::uint64_t kept = store->sequence();
  while (kept > 0 && store->wasGivenUp({kept, kept})) --kept;
  EXPECT_EQ(static_cast<std::uint64_t>(storedEvents()), kept);
}

TEST_F(StoreWriterTest, RowsOutlastADiskThatFails) {
  const auto store = open();
  test::OtherProgram other(storePath());
  other.query("BEGIN IMMEDIATE");
  store->append(event("waits"));
  lines_.await("cannot write the store");
  EXPECT_EQ(store->settledThrough(), 0U);
  EXPECT_FALSE(store->commitNow(1ms));
  other.query("ROLLBACK");
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_FALSE(store->wasGivenUp({1, 1}));
  EXPECT_EQ(storedEvents(), 1);
}

TEST_F(StoreWriterTest, AFullDiskLosesNothingThatFitsIntoMemory) {
  const auto store = open();
  ASSERT_TRUE(store->commitNow(kPatience));
  ASSERT_NE(std::signal(SIGXFSZ, SIG_IGN), SIG_ERR);
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  rlimit full = before;
  full.rlim_cur = 64 * 1024;
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &full), 0);
  constexpr int kRows = 1000;
  const std::string payload(1000, 'x');
  for (int i = 0; i < kRows; ++i) store->append(event(payload));
  lines_.await("cannot write the store");
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &before), 0);
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_EQ(storedEvents(), kRows);
  EXPECT_THAT(test::OtherProgram(storePath()).query("PRAGMA integrity_check"), ElementsAre("ok"));
}

TEST_F(StoreWriterTest, PastTheBoundTheOldestAreGivenUpAndTheirNumberIsStored) {
  const auto store = open({.most_bytes = 4096, .chunk_bytes = 1024});
  constexpr std::uint64_t kRows = 100;
  const std::string payload(200, 'x');
  test::OtherProgram other(storePath());
  other.query("BEGIN IMMEDIATE");
  store->append(event(payload));
  lines_.await("cannot write the store");
  std::promise<void> some_settled;
  store->observeProgress([&, told = false](std::uint64_t) mutable {
    if (!std::exchange(told, true)) some_settled.set_value();
  });
  while (store->sequence() < kRows) store->append(event(payload));
  some_settled.get_future().wait();  // told although nothing can be committed
  store->observeProgress({});
  EXPECT_TRUE(store->wasGivenUp({1, 1}));
  EXPECT_FALSE(store->wasGivenUp({kRows, kRows}));
  other.query("ROLLBACK");
  ASSERT_TRUE(store->commitNow(kPatience));
  std::uint64_t given_up = 0;
  for (std::uint64_t row = 1; row <= kRows; ++row) given_up += store->wasGivenUp({row, row}) ? 1 : 0;
  EXPECT_GT(given_up, 50U);
  EXPECT_EQ(static_cast<std::uint64_t>(storedEvents()) + given_up, kRows);
  EXPECT_THAT(other.query("SELECT sum(payload ->> 'rows') FROM events WHERE name LIKE '%RowsGivenUp'"),
              ElementsAre(std::to_string(given_up)));
}

TEST_F(StoreWriterTest, ClosingOnADiskThatFailsEndsAndSaysWhatIsLost) {
  const auto store = open();
  test::OtherProgram other(storePath());
  other.query("BEGIN IMMEDIATE");
  store->append(event("lost"));
  store->flushAndClose();
  EXPECT_TRUE(store->wasGivenUp({1, 1}));
  EXPECT_EQ(lines_.count("1 rows are given up"), 1U);
}

TEST_F(StoreWriterTest, TooManyWaitingRowsAreToldOfUntilTheyAreWritten) {
  const auto store = open();
  std::promise<void> writing;
  std::promise<void> go;
  store->observeProgress([&, first = true, released = go.get_future().share()](std::uint64_t) mutable {
    if (std::exchange(first, false)) writing.set_value();
    released.wait();
  });
  std::promise<void> relieved;
  std::atomic<int> calls = 0;
  store->observeBackLog([&] {
    if (++calls == 2) relieved.set_value();
  });
  store->requestCommit(store->append(event("")));
  writing.get_future().wait();
  const std::string payload(100'000, 'x');
  while (!store->overBound()) store->append(event(payload));
  EXPECT_EQ(calls, 1);
  EXPECT_GT(store->sequence(), 100U);
  EXPECT_LT(store->sequence(), 200U);
  go.set_value();
  relieved.get_future().wait();
  EXPECT_FALSE(store->overBound());
  store->observeProgress({});
  store->observeBackLog({});
}

TEST_F(StoreWriterTest, ADiskThatFailsDoesNotStopTheService) {
  constexpr std::uint64_t kRows = 300;  // 30 MB: far over the bound for a sound disk, within memory
  const auto store = open();
  test::OtherProgram other(storePath());
  other.query("BEGIN IMMEDIATE");
  store->append(event(""));
  lines_.await("cannot write the store");
  const std::string payload(100'000, 'x');
  while (store->sequence() < kRows) {
    store->append(event(payload));
    ASSERT_FALSE(store->overBound()) << store->sequence();
  }
  EXPECT_FALSE(store->wasGivenUp({1, kRows}));
  other.query("ROLLBACK");
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_EQ(storedEvents(), static_cast<long>(kRows));
}

TEST_F(StoreWriterTest, RetentionRunsAtTheStart) {
  open()->append(event("old", clock_.secondsSince1970()));
  clock_.setWallClock(clock_.secondsSince1970() + 31.0 * 86400);
  const auto store = open();
  store->append(event("new", clock_.secondsSince1970()));
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_THAT(test::OtherProgram(storePath()).query("SELECT payload FROM events"), ElementsAre("new"));
}

class WantedEventsTest : public test::StoreFixture {
 protected:
  void setWanted(const MessageValue& value) {
    settings_.setValue("org.vantle.talsys.analytics", "wanted", value);
  }

  WantedEvents wanted_{
      {.settings = settings_, .log = log_.service, .coarse_now = [this] { return clock_.monotonic(); }}};
};

TEST_F(WantedEventsTest, AnswersWhatTheSettingSays) {
  struct Case {
    std::string what;
    MessageValue setting;
    bool start, stop;
  };
  const std::vector<Case> cases{
      {"empty list", MessageArray{}, false, false},
      {"exact name", MessageArray{"org.a.Start"}, true, false},
      {"star", MessageArray{"org.*"}, true, true},
      {"star in the middle", MessageArray{"*.St?p"}, false, true},
      {"set", MessageArray{"org.a.St[a-n]rt"}, true, false},
      {"several", MessageArray{"nothing", "*Stop", "*Start"}, true, true},
      {"part of a name", MessageArray{"org.a"}, false, false},
      {"unfinished set", MessageArray{"org.a.[St"}, false, false},
      {"no list", "org.*", true, true},
      {"no list of texts", MessageArray{"org.b", 1}, true, true},
  };
  EXPECT_TRUE(wanted_.contains("org.a.Start")) << "absent";
  for (const Case& row : cases) {
    setWanted(row.setting);
    clock_.advance(500ms);
    for (int again = 0; again < 2; ++again) {
      EXPECT_EQ(wanted_.contains("org.a.Start"), row.start) << row.what;
      EXPECT_EQ(wanted_.contains("org.a.Stop"), row.stop) << row.what;
      clock_.advance(500ms);
    }
  }
  EXPECT_EQ(lines_.count("the setting wanted"), 2U) << "once for each of the two wrong values";
  settings_.clear();
  clock_.advance(500ms);
  EXPECT_TRUE(wanted_.contains("org.a.Start"));
}

TEST_F(WantedEventsTest, NamesBeyondNumberAreStillAnswered) {
  setWanted(MessageArray{"*7"});
  for (int i = 0; i < 20000; ++i) ASSERT_EQ(wanted_.contains(std::to_string(i)), i % 10 == 7) << i;
}

TEST_F(StoreWriterTest, EventsAreStoredAsJsonUnderTheirNames) {
  const auto store = open();
  StoreAnalyticsSink sink({.store = *store,
                           .clock = clock_,
                           .wanted = {.settings = settings_, .log = log_.service, .coarse_now = [] {
                                        return Clock::Instant(1);
                                      }}});
  EXPECT_TRUE(sink.eventIsWanted("org.a.Start"));
  const MessageDict payload{{"volume", 1.0}, {"device", "Speaker \"1\""}};
  sink.sendEventWithPayloadProvider("org.a.Start", [&payload] { return payload; });
  sink.sendEventWithPayloadProvider("org.b.Start", [&] { return MessageDict{}; });
  ASSERT_TRUE(store->commitNow(kPatience));
  EXPECT_THAT(test::OtherProgram(storePath()).query("SELECT recorded_at, name, payload FROM events"),
              ElementsAre("1769870702.5|org.a.Start|{\"volume\":1.0,\"device\":\"Speaker \\\"1\\\"\"}",
                          "1769870702.5|org.b.Start|{}"));
}

}  // namespace
}  // namespace tal
