#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/linux/store/StoreCommitter.h"
#include "platform/store/StoreFixture.h"

namespace tal {
namespace {

using std::chrono_literals::operator""ms;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr double kSecondsPerDay = 86400;

class RtcTablesTest : public test::StoreFixture {
 protected:
  StoreCommitter& store() {
    if (!committer_) {
      committer_ = std::make_unique<StoreCommitter>(StoreCommitter::Dependencies{
          .directory = directory_.path(), .settings = settings_, .clock = clock_, .log = log_.service});
    }
    return *committer_;
  }
  void reopen() { committer_.reset(); }
  void commit(const std::vector<StoreRow>& rows) {
    std::size_t bytes = 0;
    for (const StoreRow& row : rows) bytes += RowChunk::sizeOf(row);
    std::vector<RowChunk> batch;
    batch.emplace_back(bytes, 1);
    for (const StoreRow& row : rows) batch.back().append(row);
    ASSERT_TRUE(store().commit(batch, {}));
  }
  void maintain() {
    clock_.advance(400ms);
    while (store().maintenanceIsDue()) store().maintainForAMoment();
  }
  StoreRow session(std::int64_t row, std::int64_t identifier = 7) const {
    return {.table = StoreTable::kRtcSessions,
            .recorded_at = clock_.secondsSince1970(),
            .number = row,
            .detail = identifier,
            .name = R"({"contains_real_time_events":true})",
            .payload = R"({"client_name":"c"})"};
  }
  static StoreRow ended(std::int64_t first, std::int64_t last) {
    return {.table = StoreTable::kRtcSessionEnds, .number = first, .detail = last};
  }
  StoreRow message(StoreTable table, std::int64_t session_row, std::string_view payload = "{}") const {
    return {.table = table,
            .recorded_at = clock_.secondsSince1970(),
            .number = session_row,
            .detail = rtcKind(0xFFFF, 0xFFFE),
            .payload = payload};
  }
  StoreRow kept(std::int64_t session_row) const { return message(StoreTable::kRtcMessages, session_row); }
  StoreRow waiting(std::int64_t session_row, std::string_view payload = "{}") const {
    return message(StoreTable::kRtcOutbox, session_row, payload);
  }
  static StoreRow joins(std::string_view broker) {
    return {.table = StoreTable::kRtcBrokerJoins, .name = broker};
  }
  static StoreRow leaves(std::string_view broker) {
    return {.table = StoreTable::kRtcBrokerLeaves, .name = broker};
  }
  static StoreRow confirmed(std::string_view broker, std::int64_t number) {
    return {.table = StoreTable::kRtcConfirmed, .number = number, .name = broker};
  }
  /// The only column of the query, row by row.
  std::vector<std::string> query(const std::string& sql) {
    return test::OtherProgram(storePath()).query(sql);
  }
  std::vector<std::string> sessions() { return query("SELECT id FROM rtc_sessions ORDER BY id"); }
  std::vector<std::string> outbox() { return query("SELECT id FROM rtc_outbox ORDER BY id"); }

 private:
  std::unique_ptr<StoreCommitter> committer_;
};

TEST_F(RtcTablesTest, MessagesAreReadWithTheirSession) {
  commit({session(3, -5), kept(3), message(StoreTable::kRtcMessages, 4, R"({"a":1})")});
  EXPECT_THAT(
      query("SELECT id, session_identifier, category, type, realtime, session_info, user_info, payload"
            " FROM rtc_messages ORDER BY id"),
      ElementsAre(R"(1|-5|65535|65534|1|{"contains_real_time_events":true}|{"client_name":"c"}|{})",
                  R"(2||65535|65534||||{"a":1})"));  // whose session was given up
}

TEST_F(RtcTablesTest, AnOlderStoreIsBroughtUpToDate) {
  commit({{.table = StoreTable::kEvents, .recorded_at = clock_.secondsSince1970(), .name = "e"}});
  reopen();
  query("DROP VIEW rtc_messages");
  for (const char* table : {"rtc_rows", "rtc_outbox", "rtc_sessions", "rtc_brokers"}) {
    query("DROP TABLE " + std::string(table));
  }
  query("PRAGMA user_version = 1");
  commit({session(1), kept(1)});
  EXPECT_THAT(query("SELECT session_identifier FROM rtc_messages"), ElementsAre("7"));
  EXPECT_THAT(query("SELECT name FROM events"), ElementsAre("e"));
}

TEST_F(RtcTablesTest, ASessionGoesWithItsLastMessageOnceItHasEnded) {
  setLimit("retain_days", 1);
  const double first = clock_.secondsSince1970();
  commit({session(1), session(2), session(3), kept(1), kept(2), kept(1), ended(1, 1)});
  clock_.setWallClock(first + 2 * kSecondsPerDay);
  commit({kept(2), kept(3), ended(2, 2)});
  maintain();
  EXPECT_THAT(query("SELECT id FROM rtc_messages"), ElementsAre("4", "5"));
  EXPECT_THAT(sessions(), ElementsAre("2", "3"));
  clock_.setWallClock(first + 4 * kSecondsPerDay);
  commit({ended(0, 3)});  // by the next daemon
  maintain();
  EXPECT_THAT(query("SELECT id FROM rtc_messages"), IsEmpty());
  EXPECT_THAT(sessions(), IsEmpty());
}

TEST_F(RtcTablesTest, AMessageLeavesTheOutboxWhenEveryBrokerHasIt) {
  commit({joins("a"), joins("b"), session(1), waiting(1), waiting(1), waiting(1), ended(1, 1)});
  commit({confirmed("a", 3), confirmed("b", 1)});
  EXPECT_THAT(outbox(), ElementsAre("2", "3"));
  commit({confirmed("a", 1)});  // an answer that comes late takes nothing back
  EXPECT_THAT(outbox(), ElementsAre("2", "3"));
  EXPECT_THAT(sessions(), ElementsAre("1"));
  commit({confirmed("b", 3)});
  EXPECT_THAT(outbox(), IsEmpty());
  EXPECT_THAT(sessions(), IsEmpty());
}

TEST_F(RtcTablesTest, ANumberIsNeverUsedAgain) {
  commit({joins("a"), session(1), waiting(1), waiting(1), confirmed("a", 2)});
  reopen();
  commit({joins("a"), waiting(1)});
  EXPECT_THAT(outbox(), ElementsAre("3"));
}

TEST_F(RtcTablesTest, ABrokerThatTakesTheOthersPlaceGetsWhatThatOneDidNotHave) {
  commit({joins("old"), session(1), waiting(1), waiting(1), waiting(1), confirmed("old", 1)});
  commit({joins("new"), leaves("old"), joins("new")});
  EXPECT_THAT(query("SELECT broker, confirmed FROM rtc_brokers"), ElementsAre("new|1"));
  commit({confirmed("new", 3), leaves("new"), joins("first again")});
  EXPECT_THAT(query("SELECT confirmed FROM rtc_brokers"), ElementsAre("3")) << "nothing of the past";
}

TEST_F(RtcTablesTest, TheOutboxGivesUpItsOldestPastItsSizeAndSaysHowMany) {
  settings_.setValue("org.vantle.talsys.rtc", "outbox_mebibytes", 1);
  const std::string payload(16 * 1024 - 64, 'x');
  std::vector<StoreRow> rows{joins("a"), session(1)};
  for (int i = 0; i < 65; ++i) rows.push_back(waiting(1, payload));
  commit(rows);
  maintain();
  EXPECT_THAT(query("SELECT count(*), min(id) FROM rtc_outbox"), ElementsAre("65|1")) << "at its size";
  commit({waiting(1, payload), waiting(1, payload)});
  maintain();
  EXPECT_THAT(query("SELECT count(*), min(id) FROM rtc_outbox"), ElementsAre("65|3"));
  EXPECT_EQ(lines_.count("2 messages for brokers were given up"), 1U);
}

TEST_F(RtcTablesTest, TheOutboxGivesUpWhatIsTooOld) {
  setLimit("retain_days", 1);
  commit({joins("a"), session(1), waiting(1), waiting(1)});
  clock_.setWallClock(clock_.secondsSince1970() + 2 * kSecondsPerDay);
  commit({waiting(1)});
  maintain();
  EXPECT_THAT(outbox(), ElementsAre("3"));
  EXPECT_EQ(lines_.count("2 messages for brokers were given up"), 1U);
}

}  // namespace
}  // namespace tal
