#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/MessageKeys.h"
#include "service/TalReportingService.h"
#include "support/JournalWorkers.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

using test::Journal;
using test::JournalWorkerOptions;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace std::chrono_literals;

/// The service with two connected clients, process 11 before process 22, and one
/// worker that writes down what it hears.
class ReportingService : public ::testing::Test {
 protected:
  ReportingService() { host.processes.names = {{11, "player"}, {22, "phone"}}; }

  void start(TalReportingService::Options options = {}) {
    options.end_process = [this] { journal.push_back("process ended"); };
    service =
        std::make_unique<TalReportingService>(host.platform, *roster, system_monitor, std::move(options));
    one = service->shouldAcceptNewConnection(11, "connection one");
    two = service->shouldAcceptNewConnection(22, "connection two");
    host.queue.runUntilIdle();
    host.log.lines.clear();
  }

  std::function<void(bool)> note(const std::string& call) {
    return [this, call](bool value) { replies.push_back(call + (value ? " true" : " false")); };
  }

  void create(const TalReportingService::Client& client, ReporterID id,
              AudioServiceType type = AudioServiceType::kLongformaudio) {
    client->createReportingSession(id, [](bool) {});
    client->setServiceType(type, id, [](bool) {});
  }
  void createAndStart(const TalReportingService::Client& client, ReporterID id,
                      AudioServiceType type = AudioServiceType::kLongformaudio) {
    create(client, id, type);
    client->startReportingSessionForID(id, note("start " + std::to_string(id)));
  }

  std::optional<ReportingError> send(const TalReportingService::Client& client, MessageDict message,
                                     const std::vector<ReporterID>& ids) {
    std::optional<ReportingError> result;
    client->prepareMessage(message, ids);
    client->sendMessage(std::move(message), AudioEventCategory::kPlayback, AudioEventType::kGeneric, ids,
                        [&result](std::optional<ReportingError> error) { result = error; });
    return result;
  }

  const TalReportingSession* session(const TalReportingService::Client& client, ReporterID id) {
    const auto found = client->clientReportingSessionMap().find(id);
    return found == client->clientReportingSessionMap().end() ? nullptr : found->second.get();
  }

  test::TestPlatform host;
  TalReportingSystemMonitor system_monitor{host.platform};
  Journal journal;
  std::vector<std::string> replies;
  std::vector<JournalWorkerOptions> workers{
      {"worker", {.is_consumer = true, .handle_single_message_session = true}}};
  std::unique_ptr<WorkerRoster> roster = test::makeJournalRoster(workers, journal, host.channels.session);
  std::unique_ptr<TalReportingService> service;
  TalReportingService::Client one;
  TalReportingService::Client two;
};

TEST_F(ReportingService, BringsTheSystemMonitorToLifeOnTheReportingQueue) {
  EXPECT_EQ(system_monitor.getSystemMonitorDictionary(), nullptr);
  start();
  ASSERT_NE(system_monitor.getSystemMonitorDictionary(), nullptr);
  host.notify_center.post("org.vantle.homeshell.ringerstate", 1);
  EXPECT_EQ(system_monitor.getSystemMonitorDictionary()->stateOf("ringerstate"), std::nullopt);
  host.queue.runUntilIdle();
  EXPECT_NE(system_monitor.getSystemMonitorDictionary()->stateOf("ringerstate"), std::nullopt);
}

TEST_F(ReportingService, HoldsTheStartReplyUntilTheStop) {
  start();
  create(one, 5);
  one->startReportingSessionForID(5, note("first start"));
  one->startReportingSessionForID(5, note("second start"));
  EXPECT_THAT(replies, IsEmpty());
  one->stopReportingSessionForID(5, note("stop"));
  EXPECT_THAT(replies, ElementsAre("first start true", "stop true"));
  one->stopReportingSessionForID(5, note("stop again"));
  EXPECT_THAT(replies, ElementsAre("first start true", "stop true", "stop again true"));
  EXPECT_TRUE(
      host.log.holds("Stop called, but session==nil or session.started==false. reporterID=5 session="));
  one->startReportingSessionForID(5, note("third start"));
  one->destroyReportingSession(5, note("destroy"));
  EXPECT_EQ(replies.back(), "destroy true");
  EXPECT_EQ(session(one, 5), nullptr);
  EXPECT_EQ(replies.size(), 4U) << "the third start goes unanswered";
}

TEST_F(ReportingService, OperationsOnWhatIsNotThereAnswerTrueAndDoNothing) {
  start();
  create(two, 9);
  for (const ReporterID id : {0, 9, 77}) {
    one->startReportingSessionForID(id, note("start"));
    one->stopReportingSessionForID(id, note("stop"));
    one->setServiceType(AudioServiceType::kAlarms, id, note("type"));
    one->setConfiguration(MessageDict{{"k", 1}}, id, note("configure"));
    one->destroyReportingSession(id, note("destroy"));
  }
  EXPECT_EQ(replies.size(), 15U);
  EXPECT_THAT(replies, ::testing::Each(::testing::EndsWith(" true")));
  EXPECT_TRUE(session(two, 9)->configuration().empty());
  EXPECT_EQ(session(two, 9)->serviceType(), AudioServiceType::kLongformaudio);
  EXPECT_EQ(host.log.count("service type 4 set for reporter  77"), 1U);
}

TEST_F(ReportingService, AnswersTheStartOfATestSessionAtOnceOnAnInternalBuildAndAgainAtTheStop) {
  host.platform.internal_build = true;
  start();
  createAndStart(one, 5, AudioServiceType::kTest);
  EXPECT_THAT(replies, ElementsAre("start 5 true"));
  one->stopReportingSessionForID(5, note("stop"));
  EXPECT_THAT(replies, ElementsAre("start 5 true", "start 5 true", "stop true"));
  replies.clear();
  createAndStart(one, 6, AudioServiceType::kAlarms);
  EXPECT_THAT(replies, IsEmpty());
}

TEST_F(ReportingService, AnotherServiceTypeMakesAnotherSession) {
  start();
  createAndStart(one, 5, AudioServiceType::kHaptics);
  one->setConfiguration(MessageDict{{"k", 1}}, 5, note("configure"));
  send(one, {{"seen", 1}}, {5});
  journal.clear();
  one->setServiceType(AudioServiceType::kHaptics, 5, note("same type"));
  EXPECT_TRUE(session(one, 5)->started());
  one->setServiceType(AudioServiceType::kAlarms, 5, note("type"));
  EXPECT_THAT(journal, ElementsAre("worker gone")) << "not stopped";
  EXPECT_FALSE(session(one, 5)->started());
  EXPECT_EQ(session(one, 5)->serviceType(), AudioServiceType::kAlarms);
  EXPECT_TRUE(session(one, 5)->configuration().contains("k"));
  EXPECT_TRUE(session(one, 5)->previousValues().contains("seen"));
  EXPECT_THAT(session(one, 5)->messages(), IsEmpty());
  one->stopReportingSessionForID(5, note("stop"));
  EXPECT_THAT(replies, ElementsAre("configure true", "same type true", "type true", "stop true"));
}

TEST_F(ReportingService, LookUpsReachAcrossClients) {
  start();
  create(two, 9, AudioServiceType::kAlarms);
  std::vector<AudioServiceType> types;
  const auto note_type = [&types](AudioServiceType type) { types.push_back(type); };
  one->getServiceNameForReporterID(9, note_type);
  one->getServiceNameForReporterID(77, note_type);
  EXPECT_THAT(types, ElementsAre(AudioServiceType::kAlarms, AudioServiceType::kUnknown));
  types.clear();
  one->getServiceNameForReporterID(0, note_type);
  EXPECT_THAT(types, ElementsAre(AudioServiceType::kUnknown, AudioServiceType::kUnknown));

  std::vector<std::string> answers;
  const auto note_dict = [&answers](const MessageDict& dict) { answers.push_back(dict.text()); };
  for (const ReporterID id : {9, 0, 77}) one->validateReporterID(id, note_dict);
  EXPECT_THAT(answers, ElementsAre("{reporterID=9, serviceType=4}", "{reporterID=0, serviceType=65535}",
                                   "{reporterID=0, serviceType=65535}"));

  create(one, 30);
  std::vector<ReporterID> reporters;
  two->getAllReporters([&reporters](std::vector<ReporterID> all) { reporters = std::move(all); });
  EXPECT_THAT(reporters, ElementsAre(30, 9));
}

TEST_F(ReportingService, TheClientThatConnectedFirstIsFoundFirstAndReporterZeroNever) {
  start();
  create(two, 9);
  create(one, 9);
  create(one, 0);
  EXPECT_EQ(service->findReportingSessionForID(9), session(one, 9));
  EXPECT_EQ(service->findReportingSessionForID(0), nullptr);
  EXPECT_EQ(service->findReportingSessionForID(8), nullptr);
  EXPECT_EQ(host.log.count("found reporting session 9 for client 11"), 1U);
  EXPECT_EQ(host.log.count("failed to find reporting session 8"), 1U);
  EXPECT_THAT(service->findReportingSessionsForIDs({0, 9, 8, 9}),
              ElementsAre(session(one, 9), session(one, 9)));
  EXPECT_THAT(service->findReportingSessionsForIDs({0, 8}), IsEmpty());
  EXPECT_EQ(service->singleMessageSession(), nullptr);
}

TEST_F(ReportingService, BroadcastReachesEveryStartedSessionWithARecordOfItsOwn) {
  start();
  createAndStart(one, 5);
  createAndStart(two, 6);
  create(two, 7);
  EXPECT_EQ(send(one, {{"n", 1}}, {}), std::nullopt);
  EXPECT_EQ(session(one, 5)->totalMessageCount(), 1);
  EXPECT_EQ(session(two, 6)->totalMessageCount(), 1);
  EXPECT_EQ(session(two, 7)->totalMessageCount(), 0);
  EXPECT_EQ(service->singleMessageSession(), nullptr);
  session(one, 5)->messages().back()->mutableMessage().set("only here", 1);
  EXPECT_FALSE(session(two, 6)->messages().back()->message().contains("only here"));
}

TEST_F(ReportingService, BroadcastWithoutSessionGoesToASessionThatEndsWhenIdle) {
  start();
  send(one, {{"n", 1}}, {});
  TalReportingSession* single = service->singleMessageSession();
  ASSERT_NE(single, nullptr);
  EXPECT_EQ(single->description(),
            "reporterID=1,serviceName=standalone,ownerPid=999,clientProcessName=(null),"
            "HostApplicationDisplayID=Unknown,started=1,singleMessageSession=1");
  EXPECT_THAT(journal, ElementsAre("worker init", "worker start", "worker got PlaybackGeneric"));

  host.queue.advance(4s);
  send(two, {{"n", 2}}, {});
  host.queue.advance(4s);  // the timer has fired at 5 s and found it in use
  EXPECT_EQ(service->singleMessageSession(), single);
  EXPECT_EQ(host.queue.waitingTimers(), 1U);
  host.queue.advance(3s);
  EXPECT_EQ(service->singleMessageSession(), nullptr);
  EXPECT_EQ(journal.back(), "worker gone");
  EXPECT_EQ(host.queue.waitingTimers(), 0U);
  EXPECT_TRUE(host.log.holds("Stopping singleMessageSession timeout=5.000000"));

  // Idle for exactly the time-out is not idle for longer: the extra microsecond decides.
  send(one, {{"n", 3}}, {});
  host.queue.advance(5s);
  EXPECT_NE(service->singleMessageSession(), nullptr);
  host.queue.advance(1us);
  EXPECT_EQ(service->singleMessageSession(), nullptr);
}

TEST_F(ReportingService, ClientsReachTheSingleMessageSessionOnlyByBroadcast) {
  start();
  send(one, {{"n", 1}}, {});
  send(one, {{"n", 2}}, {1});
  EXPECT_EQ(service->singleMessageSession()->totalMessageCount(), 1);
  createAndStart(two, 1);
  send(one, {{"n", 3}}, {1});
  EXPECT_EQ(session(two, 1)->totalMessageCount(), 1);
}

TEST_F(ReportingService, MarksBroadcastsOnInternalBuildsAlone) {
  host.platform.internal_build = true;
  start();
  createAndStart(one, 5);
  send(one, {{"n", 1}}, {});
  send(one, {{"n", 2}}, {5});
  const auto& kept = session(one, 5)->messages();
  ASSERT_EQ(kept.size(), 3U);
  EXPECT_EQ(*kept[1]->message().find("sendSingleMessage"), MessageValue(1));
  EXPECT_FALSE(kept[2]->message().contains("sendSingleMessage"));
}

TEST_F(ReportingService, DisabledReportingRefusesMessagesAndFindsNothing) {
  start();
  createAndStart(one, 5);
  service->setReportingEnabled(false);
  EXPECT_EQ(send(one, {}, {5}), ReportingError::kReportingDisabled);
  EXPECT_EQ(service->findReportingSessionForID(5), nullptr);
  service->setReportingEnabled(true);
  EXPECT_EQ(session(one, 5)->totalMessageCount(), 0);
  EXPECT_EQ(send(one, {}, {77}), std::nullopt) << "a message that finds no session is a success";
}

TEST_F(ReportingService, WhoKeepsTooMuchIsRefusedUntilItStopsASession) {
  start({.max_kept_bytes = 20'000});
  createAndStart(one, 5);
  createAndStart(two, 6);
  int sent = 0;
  while (sent < 1000 && !send(one, {{"n", sent}, {"text", std::string(1000, 'x')}}, {5})) ++sent;
  EXPECT_GT(sent, 10);
  EXPECT_LT(sent, 20);
  EXPECT_EQ(send(one, {{"n", -1}}, {6}), ReportingError::kKeepsTooMuch) << "whatever session it is for";
  EXPECT_EQ(send(two, {{"n", -1}}, {}), ReportingError::kKeepsTooMuch) << "one of the sessions is full";
  EXPECT_EQ(session(two, 6)->totalMessageCount(), 0) << "refused as a whole";
  EXPECT_EQ(send(two, {{"n", 1}}, {6}), std::nullopt);
  one->stopReportingSessionForID(5, note("stop"));
  EXPECT_EQ(send(one, {{"n", 1}}, {6}), std::nullopt);
}

TEST_F(ReportingService, EndlessBroadcastsDoNotKeepMessagesWithoutEnd) {
  start({.max_kept_bytes = 20'000});
  for (int i = 0; i < 100; ++i) {
    EXPECT_EQ(send(one, {{"n", i}, {"text", std::string(1000, 'x')}}, {}), std::nullopt);
  }
  EXPECT_LT(service->singleMessageSession()->messages().size(), 25U);
}

TEST_F(ReportingService, AConnectionThatEndsStopsItsSessionsAndTellsItsUptime) {
  start();
  createAndStart(one, 5);
  create(one, 6);
  host.clock.advance(90s);
  journal.clear();
  host.analytics.events.clear();
  service->interruptionHandler(one);
  service->invalidationHandler(one, 11);
  EXPECT_THAT(journal, IsEmpty()) << "only posted";
  host.queue.runUntilIdle();
  EXPECT_THAT(journal, ElementsAre("worker stop", "worker gone"));
  EXPECT_THAT(replies, IsEmpty()) << "the held start stays unanswered";
  EXPECT_THAT(service->getAllClients(), ElementsAre(two));
  EXPECT_EQ(host.log.count("removing 11 from the server client list"), 1U)
      << "by the first of the two handlers";
  EXPECT_EQ(host.log.count("invalidationHandler: connection exited process=player uptime_sec=90"), 1U);
  ASSERT_EQ(host.analytics.events.size(), 1U);
  EXPECT_EQ(host.analytics.events[0].first, "org.vantle.talsys.talreportingclientuptime");
  EXPECT_EQ(host.analytics.events[0].second.text(), "{processName=player, seconds=90}");
}

TEST_F(ReportingService, UptimeOfClientsOfWhichLittleIsKnown) {
  start();
  const auto nameless = service->shouldAcceptNewConnection(33, "connection three");
  host.queue.runUntilIdle();
  host.clock.setWall(host.clock.secondsSince1970() - 10);
  service->invalidationHandler(two, 22);
  service->invalidationHandler(nameless, 33);
  service->invalidationHandler({}, 44);
  host.queue.runUntilIdle();
  EXPECT_EQ(host.log.count("clientStartDate is in the past. clientpid=22 clientprocessname=phone"), 1U);
  ASSERT_EQ(host.analytics.events.size(), 1U);
  EXPECT_EQ(*host.analytics.events[0].second.find("seconds"), MessageValue(10));
  EXPECT_EQ(host.log.count("clientProcessName is nil. clientpid=33"), 1U);
  EXPECT_EQ(host.log.count("clientStartDate is nil. clientpid=44 clientprocessname=unknown"), 1U);
  EXPECT_EQ(host.log.count("invalidationHandler: connection exited process=unknown uptime_sec=-1"), 1U);
}

TEST_F(ReportingService, OrderlyEndStopsEverySession) {
  start();
  createAndStart(one, 5);
  createAndStart(two, 6);
  service->stopAllSessions();
  EXPECT_FALSE(session(one, 5)->started() || session(two, 6)->started());
  send(one, {}, {});
  service->stopAllSessions();
  EXPECT_EQ(service->singleMessageSession(), nullptr);
  EXPECT_THAT(replies, IsEmpty());
}

TEST_F(ReportingService, KillEndsTheProcess) {
  start();
  one->killService();
  EXPECT_THAT(journal, ElementsAre("process ended"));
  EXPECT_EQ(host.log.count("DESTROYING SERVICE"), 1U);
}

}  // namespace
}  // namespace tal
