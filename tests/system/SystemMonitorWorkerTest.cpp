#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "support/TestPlatform.h"
#include "system/TalReportingSessionSystemMonitorWorker.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::string_view kRinger = "org.vantle.homeshell.ringerstate";

/// Sessions whose one worker is the system monitor's.
class SystemMonitorWorker : public testing::Test {
 protected:
  SystemMonitorWorker() {
    std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
    classes.push_back(std::make_unique<TalReportingSessionSystemMonitorWorkerClass>(monitor));
    roster = std::make_unique<WorkerRoster>(std::move(classes), host.channels.session);
    host.clock.setWall(1'800'000'000.5);
  }
  std::unique_ptr<TalReportingSession> makeSession() {
    return std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {42}}, host.platform, *roster,
        kept_bytes);
  }
  void post(std::string_view name, std::uint64_t state) {
    host.clock.advance(std::chrono::seconds(1));
    host.notify_center.post(name, state);
    host.queue.runUntilIdle();
  }
  /// The messages of the worker that the session has kept.
  static std::vector<std::string> received(const TalReportingSession& session) {
    std::vector<std::string> texts;
    for (const auto& message : session.messages()) {
      if (message->category() == AudioEventCategory::kSetup && message->type() == AudioEventType::kSetup)
        texts.push_back(message->message().text());
    }
    return texts;
  }

  test::TestPlatform host;
  TalReportingSystemMonitor monitor{host.platform};
  std::unique_ptr<WorkerRoster> roster;
  std::size_t kept_bytes = 0;
};

TEST_F(SystemMonitorWorker, SendsWhatIsFiledAtTheStartAndEachChangeToEverySessionThatRuns) {
  host.settings.setValue("org.vantle.talsys", "device_name", "hall");
  monitor.initializeWithQueue(host.queue);
  const auto first = makeSession();
  const auto second = makeSession();
  const auto idle = makeSession();
  first->start();
  const std::string at_start =
      "{device_name=hall, last_updated=1800000000.5, invalid_timestamp=nil, "
      "talreporting_timestamp=1800000000.5, audiotag=SetupSetup, HostApplicationDisplayID=Unknown}";
  EXPECT_THAT(received(*first), ElementsAre(at_start));
  second->start();
  post(kRinger, 1);
  const std::string change =
      "{ringerstate=1, last_updated=1800000001.5, invalid_timestamp=nil, "
      "talreporting_timestamp=1800000001.5, audiotag=SetupSetup, HostApplicationDisplayID=Unknown}";
  EXPECT_THAT(received(*first), ElementsAre(at_start, change));
  EXPECT_THAT(received(*second), ElementsAre(at_start, change));
  EXPECT_THAT(received(*idle), IsEmpty());
  EXPECT_TRUE(monitor.getSystemMonitorDictionary()->stateOf("ringerstate")->contains("systemuptime_sec"))
      << "what is filed stays as it is";
}

TEST_F(SystemMonitorWorker, AStoppedSessionHearsNothingUntilItStartsAgain) {
  monitor.initializeWithQueue(host.queue);
  const auto session = makeSession();
  session->start();
  session->stop();
  post(kRinger, 1);
  EXPECT_THAT(received(*session), IsEmpty());
  session->start();
  EXPECT_EQ(received(*session).size(), 1U);
  post(kRinger, 0);
  EXPECT_EQ(received(*session).size(), 2U) << "told once, however often it was started";
}

TEST_F(SystemMonitorWorker, AWorkerThatGoesWithoutAStopLeavesNothingBehind) {
  monitor.initializeWithQueue(host.queue);
  const auto session = makeSession();
  auto worker = roster->validClasses()[0]->initWithSession(*session);
  worker->start();
  post(kRinger, 1);
  EXPECT_EQ(received(*session).size(), 1U);
  worker.reset();
  post(kRinger, 0);
  EXPECT_EQ(received(*session).size(), 1U);
}

TEST_F(SystemMonitorWorker, AMonitorThatEndsFirstLeavesTheOldDictionaryToTheWorker) {
  monitor.initializeWithQueue(host.queue);
  const auto session = makeSession();
  session->start();
  const auto old = monitor.getSystemMonitorDictionary();
  monitor.reset();
  old->file("ringerstate", {{"ringerstate", true}});
  EXPECT_EQ(received(*session).size(), 1U);
  session->stop();
}

TEST_F(SystemMonitorWorker, WithoutAMonitorThereIsNothingToSayOrToTakeBack) {
  const auto session = makeSession();
  session->start();
  EXPECT_THAT(received(*session), IsEmpty());
  session->stop();
}

TEST_F(SystemMonitorWorker, AStateWithoutATimeStampIsSentAsItIsAndAnEmptyOneNotAtAll) {
  const auto session = makeSession();
  TalReportingSessionSystemMonitorWorker worker(*session, nullptr, {});
  worker.handleChange(MessageDict{{"value", MessageArray{1}}, {"systemuptime_sec", 5}});
  worker.handleChange(MessageDict{});
  worker.handleChange(MessageDict{{"talreporting_timestamp", "text"}});
  worker.handleChange(std::nullopt);
  const auto& messages = session->messages();
  ASSERT_EQ(messages.size(), 2U);
  EXPECT_EQ(messages[0]->message().find("systemuptime_sec")->toInt64(), 5);
  EXPECT_FALSE(messages[0]->message().contains("last_updated"));
  EXPECT_EQ(messages[1]->message().find("last_updated")->text(), "text");
}

}  // namespace
}  // namespace tal
