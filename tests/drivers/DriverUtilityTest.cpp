#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "drivers/TalReportingDriverUtility.h"
#include "support/SessionFixture.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

DriverStatsChannel simple(std::string name, std::int64_t value) {
  return {.description = {.driver_name = "amp", .group = "Tx", .channel_name = std::move(name)},
          .integer_value = value};
}

class DriverUtility : public test::SessionFixture {
 protected:
  DriverUtility() { makeSession(); }

  TalReportingDriverUtility makeUtility() { return {host.driver_stats, host.channels.driver_utility}; }
  /// "type {entries}" of what was sent, in order, without what intake adds.
  std::vector<std::string> sent() {
    std::vector<std::string> texts;
    for (const auto& message : session().messages()) {
      EXPECT_EQ(message->category(), AudioEventCategory::kDrvstats);
      MessageDict entries = message->message();
      for (const MessageKey key :
           {"invalid_timestamp", "talreporting_timestamp", "audiotag", "HostApplicationDisplayID"}) {
        entries.erase(key);
      }
      texts.push_back(std::to_string(static_cast<int>(message->type())) + ' ' + entries.text());
    }
    return texts;
  }

  test::FakeDriverStatsFeed::Driver& driver(const std::string& name) {
    return host.driver_stats.drivers[name];
  }
};

TEST_F(DriverUtility, KeyIsMadeOfThePartsThatThereAreWithOneKindOfSeparator) {
  using Row = std::pair<DriverStatsDescription, std::string>;
  const std::vector<Row> rows{
      {{.driver_name = "Speaker<0x1f>_2", .group = "My_ Group", .subgroup = "s s", .channel_name = "a_b c"},
       "Speaker_MyGroup_ss_Simple_abc"},
      {{.driver_name = "<all>", .channel_name = "n<1>"}, "_Simple_n<1>"},
      {{.group = "Tx"}, "Tx_Simple_"},
      {{.subgroup = "MCA", .channel_name = "n"}, "MCA_Simple_n"},
      {{}, "Simple_"}};
  for (const auto& [description, key] : rows) {
    EXPECT_EQ(TalReportingDriverUtility::getDriverStatsKey({.description = description}, "Simple"), key);
  }
}

TEST_F(DriverUtility, SubscribesInOrderToTheDriversThatHaveChannels) {
  driver("Speaker-*").channels_error = -536870212;
  driver("Haptics-Stats").channels = {simple("n", 1)};
  driver("Rx-*").channels = {simple("n", 1)};
  driver("Rx-*").subscription_error = 7;
  driver("*-IOAudio2").channels = {simple("n", 1)};
  const auto utility = makeUtility();
  EXPECT_THAT(host.driver_stats.asked,
              ElementsAre("VantleAE2MCA-*", "Speaker-*", "*-MCA", "Haptics-Stats",
                          "StateTransitionTimes_ms-*", "Rx-*", "Tx-*", "*-IOAudio2", "pdm-*"));
  std::vector<std::string> lines;
  for (const auto& line : host.log.lines) {
    if (line.channel == "talrd") lines.push_back(std::string(logLevelName(line.level)) + ' ' + line.text);
  }
  EXPECT_THAT(lines,
              ElementsAre("info creating drvstats driver utility",
                          "info couldn't find any channels for driver group VantleAE2MCA-(null)",
                          "error error -536870212 getting channels for driver Speaker-(null)",
                          "info couldn't find any channels for driver group (null)-MCA",
                          "info subscribed to group group Haptics-Stats",
                          "info couldn't find any channels for driver group StateTransitionTimes_ms-(null)",
                          "error error 7 creating subscription for Rx-(null)",
                          "info couldn't find any channels for driver group Tx-(null)",
                          "info subscribed to group group (null)-IOAudio2",
                          "info couldn't find any channels for driver group pdm-(null)"));
  ASSERT_EQ(utility.ioChannelSubscriptions().size(), 2U);
  EXPECT_EQ(utility.ioChannelSubscriptions()[1].subscribed_channels.channels.size(), 1U);
}

TEST_F(DriverUtility, SendsOneMessageForEachFormatInItsEncoding) {
  const auto state = [](std::string name, std::uint64_t residency) {
    return DriverStatsState{
        .name = std::move(name), .in_transition_count = 3, .residency = residency, .duty_cycle = 0.25};
  };
  DriverStatsChannel states{
      .description = {.format = DriverStatsFormat::kState, .group = "Power", .channel_name = "amp"},
      .states = {state("on", 5), state("off", 0), state("idle", 15)}};
  DriverStatsChannel idle{
      .description = {.format = DriverStatsFormat::kState, .group = "Power", .channel_name = "idle"},
      .states = {state("off", 0)}};
  DriverStatsChannel histogram{
      .description = {.format = DriverStatsFormat::kHistogram, .channel_name = "fill", .unit_label = "us"},
      .buckets = {{10, 19, 4}, {20, 29, 0}, {30, 39, 2}},
      .minimum = 11,
      .maximum = 38};
  DriverStatsChannel below = histogram;
  below.description.channel_name = "below";
  below.description.unit_label.reset();
  below.buckets = {{-30, -21, 1}, {0, 0, 9, 5}};
  DriverStatsChannel unhit = histogram;
  unhit.description.channel_name = "unhit";
  unhit.buckets = {{10, 19, 0}};
  auto& channels = driver("pdm-*").channels;
  channels = {simple("n", 0), states, idle, histogram, below, unhit};
  auto utility = makeUtility();
  for (auto& channel : channels) {
    // The snapshot is empty, so that the differences are the values above.
    channel.integer_value = 0;
    for (auto& each : channel.states) each.residency = 0;
    for (auto& each : channel.buckets) each.hits = 0;
  }
  const auto snap_shot = utility.getSnapShot();
  channels = {simple("n", 8), states, idle, histogram, below, unhit};
  utility.sendDriverLogsForSession(session(), &snap_shot);
  EXPECT_THAT(
      sent(),
      ElementsAre("16 {amp_Tx_Simple_n=8}",
                  "17 {Histogram_fill=count=3,lower=0,upper=39,min=11,max=38,unit=us::10-19:4;30-39:2, "
                  "Histogram_below=count=2,lower=-30,upper=0,min=11,max=38,unit=(null)::-30--21:1;0-0:9}",
                  "18 {Power_State_amp=name:on,transition:3,residency:5,duty_cycle:0.250000;"
                  "name:idle,transition:3,residency:15,duty_cycle:0.250000;, Power_State_idle=}"));
  EXPECT_EQ(host.log.count("Error in getting the bucket bounds : 5"), 1U);
  EXPECT_EQ(host.log.count("the current reported data is : "), 1U);
}

TEST_F(DriverUtility, DropsCountersThatDidNotRiseAndFormatsThatItDoesNotKnow) {
  auto& channels = driver("Tx-*").channels;
  channels = {simple("rises", 5), simple("stands", 5), simple("falls", 5), simple("twice", 5),
              simple("twice", 5)};
  for (const int format : {0, 4, 5, 255}) {
    channels.push_back({.description = {.format = static_cast<DriverStatsFormat>(format), .group = "G"}});
  }
  auto utility = makeUtility();
  const auto snap_shot = utility.getSnapShot();
  channels[0].integer_value = 6;
  channels[2].integer_value = 4;
  channels[3].integer_value = 7;
  channels[4].integer_value = 8;
  utility.sendDriverLogsForSession(session(), &snap_shot);
  EXPECT_THAT(sent(), ElementsAre("16 {amp_Tx_Simple_rises=1, amp_Tx_Simple_twice=3}"));
  std::vector<std::string> lines;
  for (const auto& line : host.log.lines) {
    if (line.text.find(" : G ") != std::string::npos) {
      lines.push_back(std::string(logLevelName(line.level)) + ' ' + line.text);
    }
  }
  EXPECT_THAT(lines,
              ElementsAre("debug Dropping sample of type : 0 for group : G subgroup : (null)",
                          "debug Dropping sample of type : 4 for group : G subgroup : (null)",
                          "error The DrvstatsFormat 5 is not supported group : G subgroup : (null)",
                          "error The DrvstatsFormat 255 is not supported group : G subgroup : (null)"));
}

TEST_F(DriverUtility, AFailureCostsItsDriverAloneAndIsSilentWithoutAnErrorValue) {
  for (const char* name : {"Speaker-*", "Rx-*", "Tx-*", "pdm-*"}) driver(name).channels = {simple(name, 1)};
  auto utility = makeUtility();
  driver("Speaker-*").samples_error = 5;
  auto snap_shot = utility.getSnapShot();
  EXPECT_EQ(snap_shot.size(), 3U);
  EXPECT_EQ(host.log.count("DrvstatCreateSamples error 5"), 1U);

  driver("Speaker-*").samples_error.reset();
  driver("Rx-*").samples_are_missing = true;
  driver("Tx-*").delta_fails = true;
  for (auto& [name, each] : host.driver_stats.drivers) {
    for (auto& channel : each.channels) channel.integer_value += 10;
  }
  utility.sendDriverLogsForSession(session(), &snap_shot);
  EXPECT_THAT(sent(), ElementsAre("16 {amp_Tx_Simple_pdm-*=10}"));
  EXPECT_EQ(host.log.count("DrvstatCreateSamples error 22"), 1U) << "not in the snapshot";
  EXPECT_EQ(host.log.count("DrvstatCreateSamples error 33"), 1U);
  EXPECT_EQ(host.log.count("sampling driver Rx-(null)"), 1U);
  EXPECT_EQ(host.log.count("getting latest samples"), 4U);
  EXPECT_EQ(host.log.count("done getting latest samples"), 4U);
}

TEST_F(DriverUtility, ALateFailureIsLoggedWhenTheSamplingIsDone) {
  driver("Tx-*").channels = {simple("n", 5)};
  auto utility = makeUtility();
  driver("Tx-*").samples_error = 5;
  host.log.lines.clear();
  utility.sendDriverLogsForSession(session(), nullptr);
  std::vector<std::string> lines;
  for (const auto& line : host.log.lines) lines.push_back(line.text);
  EXPECT_THAT(lines, ElementsAre("getting latest samples", "done getting latest samples",
                                 "DrvstatCreateSamples error 5"));
}

TEST_F(DriverUtility, WithoutASnapshotNothingIsReported) {
  driver("Tx-*").channels = {simple("n", 5)};
  auto utility = makeUtility();
  utility.sendDriverLogsForSession(session(), nullptr);
  EXPECT_THAT(host.driver_stats.sampled, ElementsAre("Tx-*"));
  EXPECT_THAT(sent(), IsEmpty());
}

}  // namespace
}  // namespace tal
