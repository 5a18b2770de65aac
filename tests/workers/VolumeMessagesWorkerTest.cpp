#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "core/MessageKeys.h"
#include "support/SessionFixture.h"
#include "workers/derived/TalReportingSessionVolumeMessagesWorker.h"

namespace tal {
namespace {

using test::messageAt;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

MessageDict running(bool on) { return {{"session_output_running", on}}; }
MessageDict volume(double gain) { return {{"RvSessionVolume", gain}}; }

class VolumeMessagesWorker : public test::SessionFixture {
 protected:
  void SetUp() override { makeSession(); }

  DerivedMessages derive(const DerivedMessages& messages, double minimum = 0.5) {
    return TalReportingSessionVolumeMessagesWorker(session()).createVolumeMessages(
        messages, MessageValue("player"), minimum);
  }
  static std::vector<double> secondsOf(const DerivedMessages& summaries) {
    std::vector<double> seconds;
    for (const auto& summary : summaries)
      seconds.push_back(summary->message().find("play_seconds")->toDouble());
    return seconds;
  }
};

TEST_F(VolumeMessagesWorker, SummaryHoldsExactlyItsKeys) {
  const auto summaries = derive({messageAt(100, {{"session_output_running", true},
                                                 {"RvSessionVolume", 0.4},
                                                 {"active_devices", "Speaker"},
                                                 {"session_selected_format", "S16LE 44100 Hz"},
                                                 {"mFormatID", "raw"},
                                                 {"mChannelsPerFrame", 2},
                                                 {"other", 1}}),
                                 messageAt(130.1, running(false))});
  ASSERT_EQ(summaries.size(), 1U);
  EXPECT_EQ(summaries[0]->category(), AudioEventCategory::kVolume);
  EXPECT_EQ(summaries[0]->type(), AudioEventType::kSummary);
  MessageDict summary = summaries[0]->message();
  EXPECT_EQ(*summary.find("play_seconds"), MessageValue(static_cast<float>(130.1 - 100)));
  summary.erase("play_seconds");
  EXPECT_EQ(summary.text(),
            "{session_selected_format=S16LE 44100 Hz, mFormatID=raw, active_devices=Speaker, "
            "HostApplicationDisplayID=player, RvSessionVolume=0.4, RvSessionVolumeBucketed=0.375, "
            "spatial-audio-accessory-feature=0, spatializationEnabled=0, ringerstate=0, mChannelsPerFrame=2, "
            "play_secondsBucketed=30, msgidx=1, msgcnt=1}");
}

TEST_F(VolumeMessagesWorker, StretchesEndWhereASettingChanges) {
  MessageDict start = running(true);
  start.merge({{"RvSessionVolume", 0.5}, {"active_devices", "Speaker"}, {"session_selected_format", "raw"}});
  struct Row {
    const char* name;
    MessageDict change;
    std::vector<double> seconds;  // of a stretch from 100 to 130 with the change at 110
  };
  const std::vector<Row> rows{{"volume", volume(0.6), {10, 20}},
                              {"the same volume", volume(0.5), {30}},
                              {"device", {{"active_devices", "Headset"}}, {10, 20}},
                              {"a device that is no text", {{"active_devices", 5}}, {30}},
                              {"format", {{"session_selected_format", "aac"}}, {10, 20}},
                              {"spatialisation", {{"spatializationEnabled", true}}, {10, 20}},
                              {"ringer", {{"ringerstate", true}}, {10, 20}},
                              {"a ringer as it was", {{"ringerstate", 0}}, {30}},
                              {"format identifier", {{"mFormatID", "x"}}, {30}},
                              {"channels", {{"mChannelsPerFrame", 6}}, {30}},
                              {"accessory feature", {{"spatial-audio-accessory-feature", true}}, {30}},
                              {"a second start", running(true), {30}},
                              {"a volume that is no number", {{"RvSessionVolume", "loud"}}, {10, 20}},
                              {"the session's end", {{"session_duration", 9}}, {10}}};
  for (const Row& row : rows) {
    EXPECT_EQ(secondsOf(derive(
                  {messageAt(100, start), messageAt(110, row.change), messageAt(130, running(false))})),
              row.seconds)
        << row.name;
  }
}

TEST_F(VolumeMessagesWorker, MinimumIsStrictAndIndicesCountWhatRemains) {
  const DerivedMessages messages{messageAt(100, running(true)), messageAt(100, volume(0.5)),
                                 messageAt(110, volume(0.6)), messageAt(130, running(false))};
  const auto summaries = derive(messages, 10);
  EXPECT_THAT(secondsOf(summaries), ElementsAre(20));
  EXPECT_EQ(*summaries[0]->message().find("msgidx"), MessageValue(1));
  EXPECT_EQ(*summaries[0]->message().find("RvSessionVolume"), MessageValue(0.6));
  EXPECT_THAT(secondsOf(derive(messages, 20)), IsEmpty());
  const auto both = derive(messages, 9.9);
  ASSERT_EQ(both.size(), 2U);
  EXPECT_EQ(*both[1]->message().find("msgidx"), MessageValue(2));
  EXPECT_EQ(*both[0]->message().find("msgcnt"), MessageValue(2));
}

TEST_F(VolumeMessagesWorker, StretchWithoutVolumeStampOrStartIsSkipped) {
  EXPECT_THAT(derive({messageAt(100, running(true)), messageAt(130, running(false))}), IsEmpty())
      << "no volume";
  MessageDict loud = running(true);
  loud.merge(volume(1));
  EXPECT_THAT(derive({messageAt(100, loud),
                      TalReportingSessionMessage::initWithMessage(
                          running(false), AudioEventCategory::kPlayback, AudioEventType::kStop)}),
              IsEmpty())
      << "no stamp";
  EXPECT_THAT(TalReportingSessionVolumeMessagesWorker(session()).createVolumeMessages(
                  {messageAt(100, loud), messageAt(130, running(false))}, std::nullopt, 0.5),
              IsEmpty())
      << "no process";
}

TEST_F(VolumeMessagesWorker, BurstEndsAStretchOnce) {
  MessageDict start = running(true);
  start.merge(volume(0.5));
  const DerivedMessages messages{messageAt(100, start), messageAt(110, {{"spatializationEnabled", true}}),
                                 messageAt(114, {{"spatial-audio-accessory-feature", true}}),
                                 messageAt(130, running(false))};
  EXPECT_THAT(secondsOf(derive(messages)), ElementsAre(14, 16)) << "at the burst's last time";
}

TEST_F(VolumeMessagesWorker, StretchKeptOverFromBeforeIsNotReportedOnItsOwn) {
  session().addPreviousValues(
      {{"session_output_running", true}, {"talreporting_timestamp", 50.0}, {"RvSessionVolume", 0.5}});
  EXPECT_THAT(derive({messageAt(130, running(false))}), IsEmpty());
  EXPECT_THAT(secondsOf(derive({messageAt(100, running(true)), messageAt(130, running(false))})),
              ElementsAre(30));
}

TEST_F(VolumeMessagesWorker, StopSendsTheSummariesBackIntoTheSession) {
  Classes classes;
  classes.push_back(std::make_unique<TalReportingSessionVolumeMessagesWorkerClass>());
  makeSession(std::move(classes)).start();
  const double now = host.clock.secondsSince1970();
  MessageDict start = running(true);
  start.merge(volume(0.5));
  session().sendMessage(messageAt(now + 1, start));
  session().sendMessage(messageAt(now + 5, running(false)));
  session().stop();
  EXPECT_EQ(*session().previousValues().find("play_seconds"), MessageValue(4));
  EXPECT_EQ(session().previousValues().find("audiotag")->text(), "VolumeSummary");
  EXPECT_EQ(host.log.count("sending volume event for reporter 7"), 1U);
  host.log.lines.clear();
  session().start();
  session().stop();
  EXPECT_EQ(host.log.count("sending volume event for reporter 7"), 0U);
}

// The summaries' times add up to the time that output ran, less what was skipped.
TEST_F(VolumeMessagesWorker, PlayingTimesOfRandomSessionsAddUp) {
  constexpr double kMinimum = 0.5;
  std::mt19937 random(20);
  for (int round = 0; round < 300; ++round) {
    DerivedMessages messages{messageAt(1000, volume(0.5))};
    double time = 1000;
    bool on = false;
    double ran = 0;
    for (std::size_t i = 0; i < 1 + random() % 40; ++i) {
      const double step = 0.25 * static_cast<double>(random() % 20);
      time += step;
      if (on) ran += step;
      if (random() % 2 == 0) {
        on = !on;
        messages.push_back(messageAt(time, running(on)));
      } else {
        messages.push_back(messageAt(time, volume(static_cast<double>(random() % 3) / 2)));
      }
    }
    if (on) messages.push_back(messageAt(time, running(false)));
    double summed = 0;
    for (const double seconds : secondsOf(derive(messages, -1))) summed += seconds;
    ASSERT_NEAR(summed, ran, 1e-3);
    double without_short = 0;
    for (const double seconds : secondsOf(derive(messages, -1)))
      without_short += seconds > kMinimum ? seconds : 0;
    double reported = 0;
    for (const double seconds : secondsOf(derive(messages, kMinimum))) reported += seconds;
    ASSERT_NEAR(reported, without_short, 1e-3);
  }
}

}  // namespace
}  // namespace tal
