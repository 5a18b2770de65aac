#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "service/WorkerRosterTable.h"
#include "session/TalReportingSession.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

std::string flagsOf(const TalReportingSessionWorkerClass& worker_class) {
  std::string flags;
  if (worker_class.isProducer()) flags += 'p';
  if (worker_class.isConsumer()) flags += 'c';
  if (worker_class.startOnInit()) flags += 'i';
  if (worker_class.handleSingleMessageSession()) flags += 's';
  return flags;
}

TEST(WorkerRosterTable, HasEveryClassInItsPlaceWithItsFlags) {
  test::TestPlatform host;
  const TalReportingSystemMonitor system_monitor(host.platform);
  const auto roster = makeWorkerRoster(host.platform, system_monitor);
  const std::vector<std::pair<std::string, std::string>> rows{{"Trace", ""},
                                                              {"VolumeMessages", "p"},
                                                              {"HuddleMessages", "p"},
                                                              {"Summary", "pc"},
                                                              {"InputMessages", "p"},
                                                              {"Tally", "cis"},
                                                              {"Energylog", "cis"},
                                                              {"MemoryLog", "ci"},
                                                              {"Plume", "cis"},
                                                              {"DriverSnapshot", "p"},
                                                              {"SystemMonitor", "p"},
                                                              {"Hound", "cs"},
                                                              {"DP", "c"},
                                                              {"SummaryJsonFile", ""},
                                                              {"AudioRegistration", "c"},
                                                              {"Rtc", "cs"},
                                                              {"TapToKite", "cs"}};
  const auto& classes = roster->getAllWorkerClasses();
  ASSERT_EQ(classes.size(), rows.size());
  for (std::size_t i = 0; i < rows.size(); ++i) {
    EXPECT_EQ(classes[i]->name(), "TalReportingSession" + rows[i].first + "Worker");
    EXPECT_EQ(flagsOf(*classes[i]), rows[i].second) << rows[i].first;
  }
  EXPECT_EQ(roster->startOnInitClasses().size(), 4U);
}

/// A session with the full roster, whose messages reach the analytics sink.
class TallyWorker : public ::testing::Test {
 protected:
  std::vector<std::string> eventNames(std::uint32_t category, std::uint16_t type) {
    host.analytics.events.clear();
    session.sendMessage(TalReportingSessionMessage::initWithMessage(
        {{"n", ++sent_}}, static_cast<AudioEventCategory>(category), static_cast<AudioEventType>(type)));
    std::vector<std::string> names;
    for (const auto& [name, payload] : host.analytics.events) names.push_back(name);
    return names;
  }

  test::TestPlatform host;
  TalReportingSystemMonitor system_monitor{host.platform};
  std::unique_ptr<WorkerRoster> roster = makeWorkerRoster(host.platform, system_monitor);
  std::size_t kept_bytes = 0;
  TalReportingSession session{
      {.reporter_id = 7, .process_identifiers = {42}}, host.platform, *roster, kept_bytes};

 private:
  int sent_ = 0;
};

TEST_F(TallyWorker, SendsEachMessageUnderItsTwoNamesFromCreationOn) {
  using Names = std::vector<std::string>;
  EXPECT_EQ(eventNames(4, 1),
            (Names{"org.vantle.talsys.Playback.Start", "org.vantle.unknown.Playback.Start"}));
  session.setServiceType(AudioServiceType::kLongformaudio);
  EXPECT_EQ(eventNames(4, 1),
            (Names{"org.vantle.talsys.Playback.Start", "org.vantle.longformaudio.Playback.Start"}));
  EXPECT_EQ(eventNames(0x10000063, 77), (Names{"org.vantle.talsys.DSP_Undefined.Generic",
                                               "org.vantle.longformaudio.DSP_Undefined.Generic"}));
}

TEST_F(TallyWorker, PayloadIsTheMessageAsIntakeLeftItAndEachEventHasItsOwn) {
  eventNames(4, 1);
  const auto& events = host.analytics.events;
  ASSERT_EQ(events.size(), 2U);
  EXPECT_EQ(events[0].second, session.messages().back()->message());
  EXPECT_EQ(events[0].second, events[1].second);
  EXPECT_EQ(events[0].second.find("audiotag")->text(), "PlaybackStart");
  host.analytics.events[0].second.set("n", -1);
  EXPECT_FALSE(events[1].second == events[0].second);
  EXPECT_FALSE(session.messages().back()->message() == events[0].second);
}

TEST_F(TallyWorker, NamesThatNobodyWantsAreAskedForAndSkipped) {
  host.analytics.wanted = {"org.vantle.unknown.Playback.Start"};
  EXPECT_EQ(eventNames(4, 1), std::vector<std::string>{"org.vantle.unknown.Playback.Start"});
  host.analytics.wanted->clear();
  host.analytics.asked.clear();
  EXPECT_TRUE(eventNames(4, 1).empty());
  EXPECT_EQ(host.analytics.asked.size(), 2U);
}

TEST_F(TallyWorker, NamesStayRightHoweverManyKindsClientsInvent) {
  for (std::uint32_t category = 100; category < 9000; ++category) eventNames(category << 16, 1);
  EXPECT_EQ(eventNames(4, 1)[0], "org.vantle.talsys.Playback.Start");
}

}  // namespace
}  // namespace tal
