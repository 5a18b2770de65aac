#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/sinks/TalReportingSessionEnergylogWorker.h"

namespace tal {
namespace {

using testing::ElementsAre;

/// A session that has not been started: the worker runs all the same.
class EnergylogWorker : public test::SessionFixture {
 protected:
  void SetUp() override {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionEnergylogWorkerClass>());
    makeSession(std::move(classes));
  }
  void nameApplication(std::string_view name) {
    session().updateConfigurationWithContentsOfConfiguration(MessageDict{{"HostApplicationDisplayID", name}});
  }
  /// The events that one message causes, as "class name payload".
  std::vector<std::string> eventsOf(MessageDict dict, AudioEventType type = AudioEventType::kEnergylog) {
    host.energylog.events.clear();
    host.log.lines.clear();
    session().sendMessage(
        test::messageAt(1'800'000'000.5, std::move(dict), AudioEventCategory::kOutput, type));
    return texts();
  }
  std::vector<std::string> texts() const {
    std::vector<std::string> result;
    for (const auto& event : host.energylog.events) {
      result.push_back(std::to_string(event.event_class) + ' ' + event.name + ' ' + event.payload.text());
    }
    return result;
  }
};

TEST_F(EnergylogWorker, OneMessageYieldsAnEventForEachThingThatItReports) {
  nameApplication("game");
  EXPECT_THAT(
      eventsOf({{"Active_Clients", MessageArray{"a", "b"}},
                {"Haptic_Active_Hardware_Time_Seconds", 301},
                {"EngineState", "EngineOn"},
                {"EngineOnTime", 2.5}}),
      ElementsAre(
          "28 Vidra_Haptics_EngineOnDuration "
          "{EngineOnDuration=2.5, ApplicationName=game, TimestampEnd=1800000000.5}",
          "28 Vidra_Haptics_ClientStatus {Status=1, ApplicationName=game, TimestampEnd=1800000000.5}",
          "28 LeakedHapticsSessionInfo {Haptic_Active_Hardware_Time_Seconds=301, Active_Clients=[a, b]}"));
  EXPECT_THAT(eventsOf({{"Haptic_Active_Hardware_Time_Seconds", 302}}),
              ElementsAre("28 LeakedHapticsSessionInfo {Haptic_Active_Hardware_Time_Seconds=302}"));
  EXPECT_THAT(eventsOf({{"Active_Clients", 1}}), ElementsAre());
  EXPECT_THAT(eventsOf({{"EngineOnTime", 1}}, AudioEventType::kGeneric), ElementsAre());
}

TEST_F(EnergylogWorker, TheEngineIsOnInTheseLettersOnly) {
  nameApplication("game");
  for (const MessageValue& state : {MessageValue("engineon"), MessageValue("EngineOff"), MessageValue(1)}) {
    EXPECT_THAT(eventsOf({{"EngineState", state}}),
                ElementsAre(testing::StartsWith("28 Vidra_Haptics_ClientStatus {Status=0,")));
  }
}

TEST_F(EnergylogWorker, AnUnknownApplicationIsNamedInTheStatusAlone) {
  for (const bool configured : {false, true}) {
    if (configured) nameApplication("Unknown");
    EXPECT_THAT(
        eventsOf({{"EngineOnTime", 1}, {"EngineState", "EngineOn"}, {"configured", configured}}),
        ElementsAre("28 Vidra_Haptics_EngineOnDuration {EngineOnDuration=1, TimestampEnd=1800000000.5}",
                    "28 Vidra_Haptics_ClientStatus {Status=1, ApplicationName=Unknown, "
                    "TimestampEnd=1800000000.5}"));
    EXPECT_EQ(host.log.count("failed to get app name for energylog"), 1U);
  }
}

TEST_F(EnergylogWorker, WithoutATimeTheEventsAreSentAllTheSame) {
  nameApplication("game");
  TalReportingSessionEnergylogWorker worker(session());
  worker.handleMessage(
      TalReportingSessionMessage::initWithMessage({{"EngineOnTime", 1}, {"EngineState", "EngineOn"}},
                                                  AudioEventCategory::kOutput, AudioEventType::kEnergylog));
  EXPECT_THAT(texts(),
              ElementsAre("28 Vidra_Haptics_EngineOnDuration {EngineOnDuration=1, ApplicationName=game}",
                          "28 Vidra_Haptics_ClientStatus {Status=1, ApplicationName=game}"));
  EXPECT_EQ(host.log.count("failed to get TalReporting timestamp for energylog"), 1U);
  EXPECT_EQ(host.log.lines.back().channel, "talrp");
}

}  // namespace
}  // namespace tal
