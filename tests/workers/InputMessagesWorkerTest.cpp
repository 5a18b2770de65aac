#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/derived/TalReportingSessionHuddleMessagesWorker.h"
#include "workers/derived/TalReportingSessionInputMessagesWorker.h"

namespace tal {
namespace {

using test::messageAt;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

MessageDict running(bool on) { return {{"session_input_running", on}}; }
MessageDict codec(const char* name, const char* rate) {
  return {{"vp_config_primary_vocoder", name}, {"vp_config_primary_vocoderFs", rate}};
}

class InputMessagesWorker : public test::SessionFixture {
 protected:
  void SetUp() override { makeSession(); }

  std::vector<std::string> derive(const DerivedMessages& messages, double minimum = 0.5) {
    std::vector<std::string> texts;
    for (const auto& summary : TalReportingSessionInputMessagesWorker(session()).createInputMessages(
             messages, MessageValue("recorder"), minimum)) {
      EXPECT_EQ(summary->category(), AudioEventCategory::kInput);
      EXPECT_EQ(summary->type(), AudioEventType::kSummary);
      texts.push_back(summary->message().text());
    }
    return texts;
  }
  std::vector<double> secondsOf(const DerivedMessages& messages, double minimum = 0.5) {
    std::vector<double> seconds;
    for (const auto& summary : TalReportingSessionInputMessagesWorker(session()).createInputMessages(
             messages, MessageValue("recorder"), minimum)) {
      seconds.push_back(summary->message().find("inputrunning_seconds")->toDouble());
    }
    return seconds;
  }
};

TEST_F(InputMessagesWorker, SummaryHoldsExactlyItsKeys) {
  EXPECT_THAT(derive({messageAt(50, running(true)), messageAt(80, running(false))}, 10),
              ElementsAre("{HostApplicationDisplayID=recorder, inputrunning_seconds=30, "
                          "inputrunning_secondsBucketed=30, msgidx=1, vp_config_operation_mode=unknown, "
                          "vp_config_input_port=unknown, active_devices=unknown, msgcnt=1}"));
}

TEST_F(InputMessagesWorker, CodecsAreCollectedSortedAndEndNoStretch) {
  MessageDict start = running(true);
  start.merge(codec("first", "8000"));
  start.merge(
      {{"vp_config_operation_mode", "chat"}, {"vp_config_input_port", "mic"}, {"active_devices", "Mic"}});
  EXPECT_THAT(
      derive({messageAt(50, start), messageAt(55, codec("B", "16000")), messageAt(60, codec("A", "24000")),
              messageAt(65, codec("C", "0.5")), messageAt(70, codec("C", "48000")),
              messageAt(80, running(false))}),
      ElementsAre("{HostApplicationDisplayID=recorder, inputrunning_seconds=30, "
                  "inputrunning_secondsBucketed=30, msgidx=1, vp_config_operation_mode=chat, "
                  "vp_config_input_port=mic, active_devices=Mic, vocoders=A:24000,B:16000,first:8000, "
                  "msgcnt=1}"));
}

TEST_F(InputMessagesWorker, StretchesEndWithTheDeviceTheStopOrTheSession) {
  MessageDict start = running(true);
  start.merge({{"active_devices", "Mic"}});
  struct Row {
    const char* name;
    MessageDict change;
    std::vector<double> seconds;  // of a stretch from 50 to 80 with the change at 60
  };
  const std::vector<Row> rows{{"device", {{"active_devices", "Headset"}}, {10, 20}},
                              {"the same device", {{"active_devices", "Mic"}}, {30}},
                              {"operation mode", {{"vp_config_operation_mode", "x"}}, {30}},
                              {"a second start", running(true), {30}},
                              {"the session's end", {{"session_duration", 10}}, {10}}};
  for (const Row& row : rows) {
    EXPECT_EQ(secondsOf({messageAt(50, start), messageAt(60, row.change), messageAt(80, running(false))}),
              row.seconds)
        << row.name;
  }
  EXPECT_THAT(secondsOf({messageAt(50, start), messageAt(80, running(false))}, 30), IsEmpty())
      << "exactly as long";
}

TEST_F(InputMessagesWorker, RunningKeptOverFromBeforeHasNoStartAndIsSkipped) {
  session().addPreviousValues({{"session_input_running", true}, {"talreporting_timestamp", 10.0}});
  EXPECT_THAT(derive({messageAt(50, running(true)), messageAt(80, running(false))}), IsEmpty());
  EXPECT_THAT(
      secondsOf({messageAt(50, running(false)), messageAt(60, running(true)), messageAt(80, running(false))}),
      ElementsAre(20));
}

std::vector<std::string> huddles(const DerivedMessages& messages) {
  std::vector<std::string> texts;
  for (const auto& summary :
       TalReportingSessionHuddleMessagesWorker::createHuddleMessages(messages, "meeting")) {
    texts.push_back(summary->message().text());
  }
  return texts;
}

TEST(HuddleMessagesWorker, SummarisesEachHuddle) {
  const auto huddle = [](double time, MessageDict dict, AudioEventType type = AudioEventType::kGeneric) {
    return messageAt(time, std::move(dict), AudioEventCategory::kHuddle, type);
  };
  EXPECT_THAT(
      huddles({huddle(10, {{"huddle_id", "a"}, {"participant_count", 3}}, AudioEventType::kActivate),
               huddle(11, {{"participant_count", "nonsense"}}),
               messageAt(12, {{"huddle_id", "a"}, {"participant_count", 99}}),
               huddle(13, {{"huddle_id", "a"}, {"active_speaker", 1}}),
               huddle(14, {{"huddle_id", "a"}, {"active_speaker", 2}, {"participant_count", 2}},
                      AudioEventType::kDeactivate),
               huddle(15, {{"huddle_id", "a"}, {"active_speaker", 2.0}}),
               huddle(99, {{"huddle_id", "a"}}, AudioEventType::kSummary)}),
      ElementsAre(
          "{huddle_id=a, huddle_seconds=5, huddle_secondsBucketed=5, participants_max=3, joined_count=1, "
          "left_count=1, active_speaker_changes=1, HostApplicationDisplayID=meeting, msgidx=1, msgcnt=2}",
          "{huddle_id=unknown, huddle_seconds=0, huddle_secondsBucketed=0, participants_max=0, "
          "joined_count=0, left_count=0, active_speaker_changes=0, HostApplicationDisplayID=meeting, "
          "msgidx=2, msgcnt=2}"));
  EXPECT_THAT(huddles({messageAt(12, {{"huddle_id", "a"}})}), IsEmpty());
}

}  // namespace
}  // namespace tal
