#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/sinks/TalReportingSessionRtcWorker.h"

namespace tal {
namespace {

using test::messageAt;
using testing::ElementsAre;
using namespace std::chrono_literals;
using Backends = std::vector<std::string>;

/// What the worker logs of its traffic, with the level in front.
class RtcWorker : public test::SessionFixture {
 protected:
  TalReportingSession& make(AudioServiceType type = AudioServiceType::kLongformaudio) {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionRtcWorkerClass>());
    rtc_class = classes.back().get();
    makeSession(std::move(classes)).setServiceType(type);
    return session();
  }
  void startWith(std::optional<Backends> backends, AudioServiceType type = AudioServiceType::kLongformaudio) {
    host.callstat.backends = std::move(backends);
    make(type).start();
    host.queue_pool.runUntilIdle();
  }
  TalReportingSessionMessage::Pointer send(MessageDict dict, std::uint32_t category = 4) {
    const auto message = messageAt(host.clock.secondsSince1970(), std::move(dict),
                                   static_cast<AudioEventCategory>(category), AudioEventType::kStart);
    session().sendMessage(message);
    return message;
  }
  void stop() {
    session().stop();
    host.queue_pool.runUntilIdle();
  }
  test::FakeCallstatBackend::Record& record(std::size_t index = 0) {
    return *host.callstat.records.at(index);
  }
  /// The value of the key in each payload that the back-end got, "-" where there is none.
  std::string sent(const char* key, std::size_t index = 0) {
    std::string all;
    for (const auto& message : record(index).sent) {
      const MessageValue* value = message.payload.find(key);
      all += (all.empty() ? "" : " ") + (value ? value->text() : "-");
    }
    return all;
  }
  std::vector<std::string> log() {
    std::vector<std::string> lines;
    for (const auto& line : host.log.lines) {
      if (line.channel == "talri") lines.push_back(std::string(logLevelName(line.level)) + ' ' + line.text);
    }
    host.log.lines.clear();
    return lines;
  }

  const TalReportingSessionWorkerClass* rtc_class = nullptr;
};

TEST_F(RtcWorker, LogsItsWholeLifeAndAllMessages) {
  startWith(Backends{"one", "two"});
  EXPECT_THAT(host.queue_pool.labels, ElementsAre("org.vantle.talsys.session.callstat"));
  EXPECT_THAT(log(), ElementsAre("info entering callstat startUp", "default list of backends [one, two]",
                                 "default waiting to find backends", "default continuing with backends!"));
  send({{"n", 1}}, 0x08000001);
  EXPECT_TRUE(record().sent.empty()) << "the reporting queue only hands over";
  host.queue_pool.runUntilIdle();
  EXPECT_THAT(log(), ElementsAre("info entering callstat sendMessage",
                                 "info CallstatAgent fake : message {n=1, audiotag=Session_GenericStart, "
                                 "HostApplicationDisplayID=Unknown} : category 1 : type 1"));
  host.callstat.send_error = "no room";
  send({{"n", 2}});
  host.queue_pool.runUntilIdle();
  EXPECT_THAT(log(),
              ElementsAre("info entering callstat sendMessage", "error error sending message no room"));
  host.callstat.send_error.reset();
  stop();
  EXPECT_THAT(
      log(), ElementsAre("default sending rtc summary event. reporterID=7",
                         "debug sending rtc summary event. reporterID=7 TAL_Session_Summary_Event=\"7\"",
                         "debug sending rtc summary event. reporterID=7 n=\"1,2\"",
                         testing::StartsWith("debug sending rtc summary event. reporterID=7 talreporting_"),
                         "debug sending rtc summary event. reporterID=7 "
                         "audiotag=\"Session_GenericStart,PlaybackStart\"",
                         "debug sending rtc summary event. reporterID=7 "
                         "HostApplicationDisplayID=\"Unknown,Unknown\"",
                         "info entering callstat sendMessage", testing::StartsWith("info CallstatAgent fake"),
                         "info entering callstat shutDown", "info stopping and setting session to nil"));
  EXPECT_EQ(record().sent.back().category, 0xFFFF);
  EXPECT_EQ(record().sent.back().type, 65535);
  EXPECT_EQ(record().flushes, 1);
  EXPECT_FALSE(record().open);
}

struct Failure {
  const char* name;
  bool refuse_token;
  std::optional<Backends> backends;
  std::vector<std::string> lines;
};

class RtcStartFails : public RtcWorker, public testing::WithParamInterface<Failure> {};

TEST_P(RtcStartFails, AndEveryMessageIsDroppedWithALine) {
  host.callstat.refuse_tokens = GetParam().refuse_token;
  startWith(GetParam().backends);
  send({{"n", 1}});
  host.queue_pool.runUntilIdle();
  for (const auto& queue : host.queue_pool.queues) queue->advance(9s);
  send({{"n", 2}});
  stop();
  std::vector<std::string> expected{"info entering callstat startUp"};
  expected.insert(expected.end(), GetParam().lines.begin(), GetParam().lines.end());
  expected.insert(expected.end(), 2, "default Session never started. handleMessage");
  expected.emplace_back("default Session never started. shutDown");
  EXPECT_EQ(log(), expected);
  for (const auto& opened : host.callstat.records) {
    EXPECT_TRUE(opened->sent.empty());
    EXPECT_EQ(opened->flushes, 0);
    EXPECT_FALSE(opened->open);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Reasons, RtcStartFails,
    testing::Values(
        Failure{
            "NoToken",
            true,
            Backends{"one"},
            {"error newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. startUp"}},
        Failure{"NoBackends",
                false,
                Backends{},
                {"error no backends found, this session won't get sent to the server",
                 "default waiting to find backends", "default failed to find backend"}},
        Failure{"NoAnswer",
                false,
                std::nullopt,
                {"default waiting to find backends", "default timed out waiting for backends"}}),
    [](const auto& row) { return row.param.name; });

TEST_F(RtcWorker, WhatArrivesWhileTheBackendIsAskedWaitsInOrder) {
  startWith(std::nullopt);
  send({{"n", 1}});
  send({{"n", 2}});
  session().stop();
  session().start();
  send({{"n", 3}});
  const auto queue = host.queue_pool.queues.at(0);
  queue->advance(9s - 1ns);
  EXPECT_TRUE(record().sent.empty());
  EXPECT_EQ(host.callstat.records.size(), 1U) << "the second start waits behind the first";
  record().handler({"late but in time"});
  queue->runUntilIdle();
  EXPECT_EQ(sent("n"), "1 2 1,2");
  EXPECT_FALSE(record().open);
  ASSERT_EQ(host.callstat.records.size(), 2U);
  EXPECT_TRUE(record(1).sent.empty()) << "its own wait has begun";
  queue->advance(1ns);
  record(1).handler({"second"});
  queue->runUntilIdle();
  EXPECT_EQ(sent("n", 1), "3");
}

TEST_F(RtcWorker, AnAnswerAfterTheWaitChangesNothing) {
  startWith(std::nullopt);
  host.queue_pool.queues.at(0)->advance(9s);
  log();
  const auto too_late = record().handler;
  too_late({"one"});
  send({{"n", 1}});
  host.queue_pool.runUntilIdle();
  EXPECT_THAT(log(), ElementsAre("default Session never started. handleMessage"));
  session().stop();
  session().start();
  host.queue_pool.runUntilIdle();
  too_late({"one"});
  send({{"n", 2}});
  host.queue_pool.runUntilIdle();
  EXPECT_TRUE(record(1).sent.empty()) << "nor does it answer for the next start";
}

struct Info {
  const char* name;
  AudioServiceType type;
  bool internal_build;
  bool single;
  MessageDict configuration;
  const char* session_info;
  const char* user_info;
};

class RtcInfo : public RtcWorker, public testing::WithParamInterface<Info> {};

TEST_P(RtcInfo, TellsOfTheSession) {
  host.platform.internal_build = GetParam().internal_build;
  host.callstat.backends = Backends{"one"};
  make(GetParam().type).setIsSingleMessageSession(GetParam().single);
  session().updateConfigurationWithContentsOfConfiguration(GetParam().configuration);
  session().start();
  host.queue_pool.runUntilIdle();
  MessageDict info = record().session_info;
  EXPECT_GT(info.find("client_version")->toDouble(), 0);
  info.erase("client_version");
  EXPECT_EQ(info.text(), GetParam().session_info);
  EXPECT_EQ(record().user_info.text(), GetParam().user_info);
}

INSTANTIATE_TEST_SUITE_P(
    Sessions, RtcInfo,
    testing::Values(
        Info{"Batched",
             AudioServiceType::kAlarms,
             false,
             false,
             {},
             "{client_type=19, session_identifier=7, batch_events=1, hierarchy_token=root, "
             "contains_real_time_events=0}",
             "{client_name=org.vantle.talsys, TalReportingSessionID=7, service_name=alarms_session}"},
        Info{"RealTime",
             AudioServiceType::kApiusage,
             true,
             false,
             {{"HostApplicationDisplayID", "app"}},
             "{client_type=19, session_identifier=7, batch_events=0, hierarchy_token=root, "
             "contains_real_time_events=1, client_bundle_identifier=app}",
             "{client_name=org.vantle.talsys, TalReportingSessionID=7, service_name=apiusage_session, "
             "session_identifier=7, HostApplicationDisplayID=app}"},
        Info{"SingleMessageWhoseConfigurationWins",
             AudioServiceType::kStandalone,
             false,
             true,
             {{"client_name", "mine"}, {"x", 1}},
             "{client_type=19, session_identifier=7, batch_events=1, hierarchy_token=root, "
             "contains_real_time_events=0}",
             "{client_name=mine, TalReportingSessionID=7, service_name=standalone, x=1}"}),
    [](const auto& row) { return row.param.name; });

TEST_F(RtcWorker, SummaryJoinsWhatBelongsInIt) {
  host.callstat.backends = Backends{"one"};
  make();
  send({{"n", "before the start"}});
  session().start();
  send({{"n", 1}, {"text", "a"}, {"list", MessageArray{1, 2}}});
  send({{"n", 1}, {"text", "a"}, {"list", MessageArray{1, 2}}});  // redundant
  const auto elsewhere = messageAt(host.clock.secondsSince1970(), {{"n", "for others"}});
  const TalReportingSessionRtcWorkerClass others;
  elsewhere->setDestinationWorkers({&others});
  session().sendMessage(elsewhere);
  const auto here = messageAt(host.clock.secondsSince1970(), {{"n", "for this one"}});
  here->setDestinationWorkers({&others, rtc_class});
  session().sendMessage(here);
  send({{"n", 2.5}, {"text", "b"}});
  stop();
  EXPECT_EQ(sent("n"), "1 for this one 2.5 1,for this one,2.5");
  EXPECT_EQ(record().sent.back().payload.text(),
            "{TAL_Session_Summary_Event=7, n=1,for this one,2.5, text=a,b, list=[1, 2], "
            "audiotag=PlaybackStart,PlaybackGeneric,PlaybackStart, "
            "HostApplicationDisplayID=Unknown,Unknown,Unknown}");
}

TEST_F(RtcWorker, TheTimestampLeavesInternalBuildsAloneAndTheRecordIsNotChanged) {
  for (const bool internal_build : {false, true}) {
    host.platform.internal_build = internal_build;
    host.callstat.records.clear();
    startWith(Backends{"one"});
    const auto message = send({{"n", 1}});
    stop();
    const std::string stamp = message->message().find("talreporting_timestamp")->text();
    EXPECT_EQ(sent("talreporting_timestamp"), internal_build ? stamp + ' ' + stamp : "- -");
  }
}

TEST_F(RtcWorker, TakesASnapshotThatLaterChangesDoNotReach) {
  startWith(Backends{"one"});
  const auto message = send({{"n", 1}, {"list", MessageArray{1}}});
  session().stop();
  message->mutableMessage().set("n", 2);
  MessageValue list = *message->message().find("list");
  list.array()->emplace_back(2);
  host.queue_pool.runUntilIdle();
  EXPECT_EQ(record().sent.back().payload.find("n")->text(), "1");
  EXPECT_EQ(record().sent.back().payload.find("list")->text(), "[1]");
}

TEST_F(RtcWorker, ReleasedWithoutAStopStillDeliversWhatItWasGiven) {
  startWith(std::nullopt);
  send({{"n", 1}});
  makeSession();
  host.queue_pool.runUntilIdle();
  record().handler({"one"});
  host.queue_pool.runUntilIdle();
  EXPECT_EQ(sent("n"), "1");
  EXPECT_FALSE(record().open);
}

TEST_F(RtcWorker, LeavesTestSessionsAlone) {
  startWith(Backends{"one"}, AudioServiceType::kTest);
  EXPECT_TRUE(host.callstat.records.empty());
  EXPECT_EQ(session().workerInstanceCount(), 0U);
}

}  // namespace
}  // namespace tal
