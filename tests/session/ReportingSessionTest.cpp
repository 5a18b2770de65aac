#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/MessageKeys.h"
#include "session/TalReportingSession.h"
#include "support/JournalWorkers.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

using test::Journal;
using test::JournalWorkerOptions;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Message = TalReportingSessionMessage;
using Traits = TalReportingSessionWorkerClass::Traits;

constexpr Traits kConsumer{.is_consumer = true};
constexpr Traits kProducer{.is_producer = true};

/// A session with a roster of its own.
class ReportingSession : public ::testing::Test {
 protected:
  TalReportingSession& make(std::vector<JournalWorkerOptions> workers = {}) {
    session_.reset();
    options_ = std::move(workers);
    roster_ = test::makeJournalRoster(options_, journal, host.channels.session);
    session_ = std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {42}}, host.platform, *roster_,
        kept_bytes);
    return *session_;
  }

  Message::Pointer send(MessageDict dict, AudioEventCategory category = AudioEventCategory::kPlayback,
                        AudioEventType type = AudioEventType::kStart) {
    dict.set("talreporting_timestamp", host.clock.secondsSince1970());
    auto message = Message::initWithMessage(std::move(dict), category, type);
    session_->sendMessage(message);
    return message;
  }

  std::vector<std::string> keptTags() const {
    std::vector<std::string> tags;
    for (const auto& message : session_->messages())
      tags.push_back(message->message().find("audiotag")->text());
    return tags;
  }

  test::TestPlatform host;
  Journal journal;
  std::size_t kept_bytes = 0;

 private:
  std::vector<JournalWorkerOptions> options_;
  std::unique_ptr<WorkerRoster> roster_;
  std::unique_ptr<TalReportingSession> session_;
};

TEST_F(ReportingSession, FreshOneDescribesItself) {
  auto& session = make();
  EXPECT_EQ(session.description(),
            "reporterID=7,serviceName=unknown,ownerPid=42,clientProcessName=(null),"
            "HostApplicationDisplayID=Unknown,started=0,singleMessageSession=0");
  session.setServiceType(AudioServiceType::kHaptics);
  session.setClientProcessName("player");
  session.start();
  EXPECT_EQ(session.description(),
            "reporterID=7,serviceName=haptics,ownerPid=42,clientProcessName=player,"
            "HostApplicationDisplayID=Unknown,started=1,singleMessageSession=0");
  EXPECT_THAT(host.trace_points.codes, ElementsAre(TraceCode::kSessionCreated, TraceCode::kSessionStarted));
}

TEST_F(ReportingSession, ConfigurationAliasNamesTheApplicationUnlessTheNameStandsBesideIt) {
  auto& session = make();
  session.updateConfigurationWithContentsOfConfiguration(std::nullopt);
  session.updateConfigurationWithContentsOfConfiguration(MessageDict{{"RvHostApplicationDisplayID", "X"}});
  EXPECT_EQ(session.configuration().text(), "{HostApplicationDisplayID=X, RvHostApplicationDisplayID=X}");
  session.updateConfigurationWithContentsOfConfiguration(
      MessageDict{{"RvHostApplicationDisplayID", "Z"}, {"HostApplicationDisplayID", "Y"}});
  EXPECT_EQ(session.configuration().text(), "{HostApplicationDisplayID=Y, RvHostApplicationDisplayID=Z}");
}

TEST_F(ReportingSession, StateMessagesByPassIntakeAndPrecedeTheTestForStarted) {
  auto& session = make({{"consumer", {.is_consumer = true, .start_on_init = true}}});
  session.start();
  session.start();
  ASSERT_EQ(session.messages().size(), 2U);
  const MessageDict& second = session.messages()[1]->message();
  EXPECT_EQ(second.find("method")->text(), "start");
  EXPECT_EQ(second.find("messages_at_start")->kind(), MessageValue::Kind::kSigned);
  EXPECT_EQ(second.find("unique_messages_at_start")->kind(), MessageValue::Kind::kUnsigned);
  EXPECT_EQ(*second.find("messages_at_start"), MessageValue(1));
  EXPECT_EQ(*second.find("unique_messages_at_start"), MessageValue(1));
  EXPECT_EQ(*second.find("reporterid"), MessageValue(7));
  EXPECT_EQ(second.find("running_at_start")->text(), "YES");
  EXPECT_EQ(second.find("audiotag")->text(), "SetupStart");
  EXPECT_EQ(second.find("invalid_timestamp")->text(), "nil");
  EXPECT_FALSE(second.contains("HostApplicationDisplayID"));
  EXPECT_EQ(session.totalMessageCount(), 0);
  EXPECT_TRUE(session.previousValues().empty());
  EXPECT_THAT(journal, ElementsAre("consumer init", "consumer start"));
  EXPECT_EQ(host.log.count("7 is already started"), 1U);
}

TEST_F(ReportingSession, StopOfOneThatNeverStartedLeavesOnlyItsStateMessage) {
  auto& session = make({{"worker", {}}});
  session.stop();
  ASSERT_THAT(keptTags(), ElementsAre("SetupStop"));
  EXPECT_EQ(session.messages()[0]->message().find("running_at_stop")->text(), "NO");
  EXPECT_THAT(journal, IsEmpty());
}

TEST_F(ReportingSession, WorkersAreCreatedInOrderStartedConsumersFirstAndStoppedProducersFirst) {
  auto& session = make({{"neither", {}},
                        {"producer", kProducer},
                        {"both", {.is_consumer = true, .is_producer = true}},
                        {"early", {.is_consumer = true, .start_on_init = true}},
                        {"consumer", kConsumer}});
  EXPECT_THAT(journal, ElementsAre("early init", "early start"));
  EXPECT_EQ(session.workerInstanceCount(), 1U);
  journal.clear();
  session.start();
  EXPECT_THAT(journal, ElementsAre("neither init", "producer init", "both init", "consumer init",
                                   "both start", "consumer start", "producer start", "neither start"));
  journal.clear();
  session.stop();
  EXPECT_THAT(journal,
              ElementsAre("producer stop", "both stop", "early stop", "consumer stop", "neither stop"));
  journal.clear();
  session.start();
  EXPECT_THAT(journal,
              ElementsAre("early start", "both start", "consumer start", "producer start", "neither start"));
  EXPECT_EQ(session.workerInstanceCount(), 5U);
}

TEST_F(ReportingSession, ClassesThatDeclineAreAskedAgainAndThoseWithoutInitNever) {
  auto& session = make({{.name = "declines", .traits = kConsumer, .declines = true},
                        {.name = "lacks", .traits = kConsumer, .lacks_init = true}});
  session.start();
  session.stop();
  session.start();
  EXPECT_THAT(journal, ElementsAre("declines init", "declines init"));
  EXPECT_EQ(host.log.count("Worker does not implement initWithSession! lacks"), 1U);
  EXPECT_TRUE(host.log.holds("action=failure worker=declines reporterID=7"));
  EXPECT_EQ(session.getAllWorkerClasses().size(), 2U);
}

TEST_F(ReportingSession, StartThatAnsweredFalseIsOfferedAgainAndTheWorkerHearsNothingUntilThen) {
  auto& session = make({{"late", kConsumer, {false, true}}});
  session.start();
  send({{"n", 1}});
  session.stop();
  session.start();
  send({{"n", 1}});
  session.stop();
  EXPECT_THAT(journal,
              ElementsAre("late init", "late start", "late start", "late got PlaybackStart", "late stop"));
  EXPECT_TRUE(host.log.holds("action=start worker=late started=NO reporterID=7"));
}

TEST_F(ReportingSession, StopLetsProducersSpeakBeforeConsumersFallSilent) {
  std::vector<std::string> seen_order;
  JournalWorkerOptions producer{"producer", kProducer};
  producer.on_stop = [&](TalReportingSession& session) {
    for (const auto& message : session.messages())
      seen_order.push_back(message->message().find("audiotag")->text());
    session.sendMessage(
        Message::initWithMessage({{"n", 1}}, AudioEventCategory::kVolume, AudioEventType::kSummary));
    EXPECT_EQ(keptTags().back(), "VolumeSummary");
  };
  auto& session = make({producer, {"consumer", kConsumer}});
  session.start();
  host.clock.advance(std::chrono::seconds(10));
  const auto early =
      Message::initWithMessage({{"talreporting_timestamp", host.clock.secondsSince1970() - 60}},
                               AudioEventCategory::kIO, AudioEventType::kError);
  session.sendMessage(early);
  journal.clear();
  session.stop();
  EXPECT_THAT(seen_order, ElementsAre("IOError", "SetupStart", "SetupStop"));
  EXPECT_THAT(journal, ElementsAre("producer stop", "consumer got VolumeSummary", "consumer stop"));
  EXPECT_THAT(session.messages(), IsEmpty());
  EXPECT_EQ(session.totalMessageCount(), 0);
  EXPECT_TRUE(session.previousValues().contains("n"));
}

TEST_F(ReportingSession, DestructionStopsNothing) {
  make({{"worker", kConsumer}}).start();
  journal.clear();
  make();
  EXPECT_THAT(journal, ElementsAre("worker gone"));
  EXPECT_THAT(host.trace_points.codes, ::testing::Contains(TraceCode::kSessionDestroyed));
}

TEST_F(ReportingSession, MessageBeforeStartIsKeptAndReachesTheWorkersThatRun) {
  auto& session = make({{"early", {.is_consumer = true, .start_on_init = true}}, {"late", kConsumer}});
  const auto message = send({{"n", 1}});
  EXPECT_FALSE(message->isSessionStarted());
  EXPECT_EQ(session.totalMessageCount(), 1);
  EXPECT_THAT(keptTags(), ElementsAre("PlaybackStart"));
  EXPECT_THAT(journal, ElementsAre("early init", "early start", "early got PlaybackStart"));
}

TEST_F(ReportingSession, DestinationWorkersAreTheOnlyOnesToHear) {
  auto& session = make({{"one", kConsumer}, {"two", kConsumer}});
  session.start();
  journal.clear();
  auto message = Message::initWithMessage({}, AudioEventCategory::kIO, AudioEventType::kGeneric);
  message->setDestinationWorkers({session.getAllWorkerClasses()[1]});
  bool replied = false;
  session.sendMessage(message, [&replied] { replied = true; });
  EXPECT_THAT(journal, ElementsAre("two got IOGeneric"));
  EXPECT_TRUE(replied);
}

TEST_F(ReportingSession, RedundantMessagesAreNeitherKeptNorDeliveredButMerged) {
  JournalWorkerOptions curious{"curious", kConsumer};
  curious.handle_redundant = true;
  auto& session = make({{"plain", kConsumer}, curious});
  session.start();
  send({{"n", 1}});
  host.clock.advance(std::chrono::seconds(1));
  journal.clear();
  const auto repeated = send({{"n", 1.0}, {"systemuptime_sec", 5}, {"processuptime_ms", 9}});
  EXPECT_TRUE(repeated->isRedundant());
  EXPECT_THAT(journal, ElementsAre("curious got PlaybackStart"));
  EXPECT_THAT(keptTags(), ElementsAre("SetupStart", "PlaybackStart"));
  EXPECT_EQ(*session.previousValues().find("systemuptime_sec"), MessageValue(5));
  EXPECT_EQ(session.totalMessageCount(), 2);
}

// Each row: what is sent first, what is sent then, and whether the second repeats it.
TEST_F(ReportingSession, RedundancyComparesWithTheLastKeptOfTheKind) {
  auto& session = make();
  const auto redundant = [this](MessageDict dict, AudioEventCategory category = AudioEventCategory::kPlayback,
                                AudioEventType type = AudioEventType::kStart) {
    return send(std::move(dict), category, type)->isRedundant();
  };
  EXPECT_FALSE(redundant({{"n", 1}}));
  EXPECT_FALSE(redundant({{"n", 1}, {"more", 1}})) << "one key more";
  EXPECT_FALSE(redundant({{"n", 1}})) << "repeats an older one only";
  EXPECT_TRUE(redundant({{"n", 1}}));
  EXPECT_FALSE(redundant({{"n", 1}}, AudioEventCategory::kRecord)) << "other category";
  EXPECT_FALSE(redundant({{"n", 1}}, AudioEventCategory::kPlayback, AudioEventType::kStop)) << "other type";
  EXPECT_TRUE(redundant({{"n", 1}})) << "with other kinds in between";
  for (int i = 0; i < 2; ++i) {
    EXPECT_FALSE(redundant({{"n", 1}}, AudioEventCategory::kPlayback, AudioEventType::kError));
    EXPECT_FALSE(redundant({{"n", 1}}, AudioEventCategory::kError, AudioEventType::kStart));
  }
  // The session's own state message is the last of its kind.
  session.start();
  MessageDict as_state = session.messages().back()->message();
  as_state.set("HostApplicationDisplayID", "Unknown");
  EXPECT_FALSE(redundant({{"method", "start"}}, AudioEventCategory::kSetup, AudioEventType::kStart));
  EXPECT_FALSE(redundant(as_state, AudioEventCategory::kSetup, AudioEventType::kStart))
      << "compared with the last";
  EXPECT_TRUE(redundant(as_state, AudioEventCategory::kSetup, AudioEventType::kStart));
  session.stop();
  EXPECT_FALSE(redundant({{"n", 1}})) << "nothing is kept over a stop";
}

TEST_F(ReportingSession, MissingAndStaleStampsAreRepaired) {
  make();
  const double now = host.clock.secondsSince1970();
  constexpr double kYear = 365.0 * 24 * 60 * 60;
  struct Row {
    const char* name;
    MessageValue stamp;
    bool repaired;
  };
  for (const Row& row :
       {Row{"a year ago to the second", now - kYear, false}, Row{"a little older", now - kYear - 1, true},
        Row{"in the future", now + kYear, false}, Row{"no number", "text", true}}) {
    Message message({{"talreporting_timestamp", row.stamp}}, AudioEventCategory::kIO,
                    AudioEventType::kGeneric);
    TalReportingSession::addMissingDates(message, now);
    const MessageValue* invalid = message.message().find("invalid_timestamp");
    EXPECT_EQ(invalid != nullptr, row.repaired) << row.name;
    EXPECT_EQ(*message.message().find("talreporting_timestamp"),
              row.repaired ? MessageValue(now) : row.stamp);
    if (invalid) {
      EXPECT_EQ(*invalid, row.stamp);
    }
  }
  Message bare({}, AudioEventCategory::kIO, AudioEventType::kGeneric);
  TalReportingSession::addMissingDates(bare, 5.5);
  EXPECT_EQ(bare.message().text(), "{invalid_timestamp=nil, talreporting_timestamp=5.5}");
}

TEST_F(ReportingSession, BlanksInKeysBecomeUnderscoresAndTheirValuesWin) {
  Message message({{"a b", 1}, {"a_b", 2}, {"tab\tkey", 3}, {"  x", 4}, {"plain", 5}},
                  AudioEventCategory::kIO, AudioEventType::kGeneric);
  TalReportingSession::removeWhiteSpaceFromKeys(message);
  EXPECT_EQ(message.message(), (MessageDict{{"a_b", 1}, {"tab\tkey", 3}, {"__x", 4}, {"plain", 5}}));
}

TEST_F(ReportingSession, TagAndApplicationNameAreAdded) {
  auto& session = make();
  session.updateConfigurationWithContentsOfConfiguration(MessageDict{{"HostApplicationDisplayID", "player"}});
  struct Row {
    MessageDict sent;
    const char* name;
  };
  for (const Row& row : {Row{{}, "player"}, Row{{{"HostApplicationDisplayID", "Unknown"}}, "player"},
                         Row{{{"HostApplicationDisplayID", "unknown"}}, "unknown"},
                         Row{{{"HostApplicationDisplayID", "other"}}, "other"}}) {
    const auto message =
        send(row.sent, static_cast<AudioEventCategory>(0x10000004), static_cast<AudioEventType>(77));
    EXPECT_EQ(message->message().find("HostApplicationDisplayID")->text(), row.name);
    EXPECT_EQ(message->message().find("audiotag")->text(), "DSP_PlaybackGeneric");
  }
}

TEST_F(ReportingSession, CountsWhatItKeepsAndGivesItBack) {
  auto& session = make();
  const std::string text(10'000, 'x');
  send({{"text", text}});
  EXPECT_GE(kept_bytes, text.size());
  session.start();
  session.stop();
  EXPECT_GE(kept_bytes, text.size()) << "still held as a previous value";
  make();
  EXPECT_EQ(kept_bytes, 0U);
}

}  // namespace
}  // namespace tal
