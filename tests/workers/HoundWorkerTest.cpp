#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "support/FakeSymptomReporter.h"
#include "support/SessionFixture.h"
#include "workers/diagnostics/TalReportingHoundWorkerInstances.h"
#include "workers/diagnostics/TalReportingSessionHoundWorker.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

/// Sessions of several clients on an internal build, with one class of workers.
class HoundWorker : public ::testing::Test {
 protected:
  HoundWorker() {
    host.platform.internal_build = true;
    host.platform.symptom_reporters = &reporter;
    host.device_properties.properties["HapticLeakCaptureOptIn"] = true;
  }

  void use(std::unique_ptr<TalReportingSessionWorkerClass> worker_class) {
    std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
    classes.push_back(std::move(worker_class));
    roster = std::make_unique<WorkerRoster>(std::move(classes), host.channels.session);
  }
  TalReportingSession& open(AudioServiceType type, std::int32_t process = 42, bool single_message = false) {
    if (!roster) use(std::make_unique<TalReportingSessionHoundWorkerClass>());
    sessions.push_back(std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {process}}, host.platform,
        *roster, kept_bytes));
    TalReportingSession& session = *sessions.back();
    session.setIsSingleMessageSession(single_message);
    session.setServiceType(type);
    session.setClientProcessName("clock");
    session.start();
    return session;
  }

  // Of one and the same moment, so that equal dictionaries make equal payloads.
  static void send(TalReportingSession& session, MessageDict dict, AudioEventCategory category,
                   AudioEventType type) {
    session.sendMessage(test::messageAt(1.8e9, std::move(dict), category, type));
  }
  static void sendEnergylog(TalReportingSession& session, MessageDict dict) {
    send(session, std::move(dict), AudioEventCategory::kPlayback, AudioEventType::kEnergylog);
  }
  void sendQuietAlarm(TalReportingSession& session, const char* issue = "LowRMS") {
    send(session, {{"issue_type", issue}, {"n", ++sent}}, AudioEventCategory::kError,
         AudioEventType::kIssueDetector);
  }

  test::TestPlatform host;
  test::FakeSymptomReporter reporter;
  std::unique_ptr<WorkerRoster> roster;
  std::size_t kept_bytes = 0;
  std::vector<std::unique_ptr<TalReportingSession>> sessions;
  int sent = 0;
};

/// Interested in messages with "n" of 'a' and above.
class ScriptedInstance final : public TalReportingHoundWorkerInstance {
 public:
  ScriptedInstance(TalReportingSession& session, const WorkerInstanceState& state, bool fires, int& fired)
      : TalReportingHoundWorkerInstance(session, std::make_shared<WorkerInstanceState>(state)),
        fires_(fires),
        fired_(fired) {}
  bool interestedInMessage(const TalReportingSessionMessage& message) const override {
    return message.message().find("n")->toInt64() >= 'a';
  }
  bool implementsFire() const override { return fires_; }
  void fire(const TalReportingSessionMessage&) override { ++fired_; }

 private:
  const bool fires_;
  int& fired_;
};

WorkerInstanceState thresholds(std::uint64_t count, double seconds, bool once) {
  WorkerInstanceState state;
  state.interestThresholdCount = count;
  state.interestThresholdDurationSeconds = seconds;
  state.oncePerSession = once;
  return state;
}

/// `steps`: a digit lets so many seconds pass; a letter sends it, lower-case ones
/// are interesting. `seen`: after each letter the count, or F where it fired.
struct TriggerRow {
  const char* name;
  WorkerInstanceState state;
  const char* steps;
  const char* seen;
  AudioServiceType service = AudioServiceType::kHaptics;
  bool fires = true;
  std::uint64_t fired_count = 0;  // where it is not the number of F
};

constexpr double kLargest = std::numeric_limits<double>::max();
constexpr std::uint64_t kAllOnes = WorkerInstanceState::kNever;

class HoundTrigger : public HoundWorker, public ::testing::WithParamInterface<TriggerRow> {};

TEST_P(HoundTrigger, FollowsItsSteps) {
  const TriggerRow& row = GetParam();
  int fired = 0;
  WorkerInstanceState* state = nullptr;
  TalReportingSessionHoundWorkerClass::InstanceClasses scripted;
  scripted.push_back({.name = "Scripted", .initWithSession = [&](TalReportingSession& session, auto&) {
                        auto made = std::make_unique<ScriptedInstance>(session, row.state, row.fires, fired);
                        state = &made->workerState();
                        return made;
                      }});
  use(std::make_unique<TalReportingSessionHoundWorkerClass>(std::move(scripted)));
  TalReportingSession& session = open(row.service);

  std::string seen;
  std::uint64_t all_fires = 0;
  for (const char* step = row.steps; *step != '\0'; ++step) {
    if (*step >= '0' && *step <= '9') {
      host.clock.advance(std::chrono::seconds(*step - '0'));
      continue;
    }
    const int before = fired;
    sendEnergylog(session, {{"n", static_cast<int>(*step)}});
    all_fires += static_cast<std::uint64_t>(fired - before);
    seen += fired > before ? 'F' : static_cast<char>('0' + state->interestedCount);
  }
  EXPECT_EQ(seen, row.seen);
  EXPECT_EQ(state->firedCount, row.fired_count == 0 ? all_fires : row.fired_count);
  EXPECT_EQ(state->interestFirstSeen.has_value(), state->interestedCount > 0);
  EXPECT_EQ(state->lastMessage.has_value(), state->interestedCount > 0);
  EXPECT_EQ(reporter.contexts.size(), state->firedCount) << "one client for each fire";
}

INSTANTIATE_TEST_SUITE_P(
    Sequences, HoundTrigger,
    ::testing::Values(
        TriggerRow{"CountsToTheThresholdAndBeginsAnew", thresholds(2, kLargest, false), "abcd", "1F1F"},
        TriggerRow{"RepeatIsNotCountedTwice", thresholds(4, kLargest, false), "aabaac", "11233F"},
        TriggerRow{"AfterAFireTheSameCountsAgain", thresholds(2, kLargest, false), "abb", "1F1"},
        TriggerRow{"UninterestingInBetweenForgetsNothing", thresholds(3, kLargest, false), "aAab", "1112"},
        TriggerRow{"ThresholdOfOneFiresEachTime", thresholds(1, kLargest, false), "aab", "FFF"},
        TriggerRow{"DefaultNeverFires", WorkerInstanceState{}, "ab9c", "123"},
        TriggerRow{"ThresholdIsUnsigned", thresholds(kAllOnes - 1, 0, false), "ab9c", "123"},
        TriggerRow{"DurationWithACountHasNoPart", thresholds(2, 60.0, false), "ab", "1F"},
        TriggerRow{"DurationWithoutACountMustBeExceeded", thresholds(0, 5.0, false), "a5b1c1d", "12F1"},
        TriggerRow{"OncePerSessionLeavesTheCounters", thresholds(2, kLargest, true), "abcde", "1F123"},
        TriggerRow{"WithoutFireOnlyCounts", thresholds(1, kLargest, false), "abc", "123",
                   AudioServiceType::kHaptics, false},
        TriggerRow{"TestModeCountsAFireWithoutFiring", thresholds(2, kLargest, false), "abcd", "1010",
                   AudioServiceType::kTest, true, 2}),
    [](const auto& row) { return std::string(row.param.name); });

TEST_F(HoundWorker, TestModeSaysSo) {
  TalReportingSession& session = open(AudioServiceType::kTest);
  for (int i = 0; i < 3; ++i) sendQuietAlarm(session);
  EXPECT_EQ(host.log.count("Skipping actual fire, as we are running in test mode."), 1U);
  EXPECT_THAT(reporter.asked, IsEmpty());
}

TEST_F(HoundWorker, InterestOfEachInstance) {
  struct Row {
    const char* name;
    AudioServiceType service;
    MessageDict message;
    AudioEventCategory category;
    AudioEventType type;
    bool interesting;
  };
  using enum AudioServiceType;
  const auto kInput = AudioEventCategory::kInput;
  const auto kOutput = AudioEventCategory::kOutput;
  const auto kError = AudioEventCategory::kError;
  const auto kEnergy = AudioEventType::kEnergylog;
  const auto kIssue = AudioEventType::kIssueDetector;
  const MessageDict quiet{{"issue_type", "LowRMS"}};
  const std::vector<Row> rows{
      {"haptic leak", kHaptics, {{"Haptic_Active_Hardware_Time_Seconds", 5}}, kOutput, kEnergy, true},
      {"of zero, any service", kAlerts, {{"Haptic_Active_Hardware_Time_Seconds", 0}}, kInput, kEnergy, true},
      {"another type", kHaptics, {{"Haptic_Active_Hardware_Time_Seconds", 5}}, kOutput, kIssue, false},
      {"another key", kHaptics, {{"Haptic_Time_Seconds", 5}}, kOutput, kEnergy, false},
      {"stuck sound", kHaptics, {{"System_Sound_Stuck_Time_Seconds", "x"}}, kOutput, kEnergy, true},
      {"quiet alarm", kAlarms, quiet, kError, kIssue, true},
      {"in a test", kTest, quiet, kError, kIssue, true},
      {"of no alarm", kTelephony, quiet, kError, kIssue, false},
      {"other category", kAlarms, quiet, kOutput, kIssue, false},
      {"other issue", kAlarms, {{"issue_type", "lowrms"}}, kError, kIssue, false},
      {"no text", kAlarms, {{"issue_type", 1}}, kError, kIssue, false},
  };
  for (const Row& row : rows) {
    host.log.lines.clear();
    send(open(row.service), row.message, row.category, row.type);
    EXPECT_EQ(host.log.holds("Interested in message. instance=TalReportingHoundWorkerInstance"),
              row.interesting)
        << row.name;
  }
}

TEST_F(HoundWorker, HapticLeaksCountOverSessionsAndNameTheProcessesOfTheLast) {
  sendEnergylog(open(AudioServiceType::kGeneric, 100), {{"Haptic_Active_Hardware_Time_Seconds", 1}});
  EXPECT_THAT(reporter.asked, IsEmpty());
  sendEnergylog(open(AudioServiceType::kGeneric, 200), {{"Haptic_Active_Hardware_Time_Seconds", 2}});
  ASSERT_EQ(reporter.asked.size(), 1U);
  const auto& [client, is_snapshot, request] = reporter.asked.front();
  EXPECT_TRUE(is_snapshot);
  EXPECT_EQ(request.signature.text(), "{signature=Sonarium/haptics/Playback/Energylog/Unknown}");
  EXPECT_EQ(request.duration_seconds, 0.0);
  EXPECT_FALSE(request.events || request.actions);
  EXPECT_EQ(request.payload->text(),
            "{PKParameters={org.vantle.EnergylogCore.PKSysLogFilterProcess={processIDs=[200]}}}");
  EXPECT_EQ(host.log.count("Parameters to Hound session accepted."), 1U);
  const auto& told = reporter.contexts.front();
  EXPECT_THAT(told.session, HasSubstr("ownerPid=200"));
  EXPECT_THAT(told.last_messages.back().message.text(), HasSubstr("Haptic_Active_Hardware_Time_Seconds=2"));

  sessions.clear();  // the reply may come when the sessions have gone
  reporter.answer(MessageDict{{kHoundDiagReplySuccess, true}, {kHoundDiagReplySessionID, "one"}});
  EXPECT_EQ(host.log.count("Started Hound session for haptics leaks. sessionId=one "
                           "response={Success=1, SessionID=one}"),
            1U);
}

TEST_F(HoundWorker, SystemSoundLeaksCaptureOnceInFifteenSeconds) {
  TalReportingSession& session = open(AudioServiceType::kSystemsounds);
  const auto leak = [&] { sendEnergylog(session, {{"System_Sound_Stuck_Time_Seconds", ++sent}}); };
  leak();
  EXPECT_EQ(reporter.asked.size(), 1U) << "the first is never held back";
  EXPECT_EQ(reporter.asked[0].request.signature.text(),
            "{signature=Sonarium/systemsounds/Playback/Energylog/Unknown}");
  host.clock.advance(std::chrono::milliseconds(14999));
  leak();
  EXPECT_EQ(reporter.asked.size(), 1U);
  EXPECT_EQ(host.log.count("Already fired TalReportingHoundWorkerInstanceSSSLeaks recently."), 1U);
  host.clock.advance(std::chrono::milliseconds(1));
  reporter.accepts = false;
  sendEnergylog(open(AudioServiceType::kGeneric), {{"System_Sound_Stuck_Time_Seconds", 77}});
  EXPECT_EQ(reporter.asked.size(), 2U);
  EXPECT_EQ(host.log.count("Parameters to Hound session not accepted!"), 1U);
  reporter.answer(std::nullopt);
  EXPECT_EQ(host.log.count("Started Hound session for system sound server leaks. "
                           "sessionId=NONE_RETURNED response=(null)"),
            1U);
}

TEST_F(HoundWorker, QuietAlarmOpensACaptureThatItsStopCancels) {
  TalReportingSession& session = open(AudioServiceType::kAlarms);
  for (int i = 0; i < 9; ++i) sendQuietAlarm(session);
  ASSERT_EQ(reporter.asked.size(), 1U) << "once in a session";
  const auto& [client, is_snapshot, request] = reporter.asked.front();
  EXPECT_FALSE(is_snapshot);
  EXPECT_EQ(request.signature.text(), "{signature=Sonarium/alarms/Error/IssueDetector/clock}");
  EXPECT_EQ(request.duration_seconds, 60.0);
  EXPECT_FALSE(request.payload || request.events || request.actions);
  EXPECT_EQ(host.log.count("Parameters to Hound session for alarm Low RMS accepted. Will fire if not "
                           "cancelled. timeout=60.000000."),
            1U);
  reporter.answer(MessageDict{{kHoundDiagReplySuccess, true}, {kHoundDiagReplySessionID, "one"}});
  EXPECT_TRUE(host.log.holds("Started Hound session for alarm Low RMS. sessionId=one timeout=60.000000"));
  EXPECT_THAT(reporter.cancelled, IsEmpty());
  session.stop();
  ASSERT_EQ(reporter.cancelled.size(), 1U);
  EXPECT_EQ(reporter.cancelled[0].identifier, "one");
  EXPECT_EQ(reporter.cancelled[0].client, client);
  EXPECT_EQ(host.log.count("Stop called. Cancelling Hound session for alarm Low RMS. sessionId=one "
                           "timeout=60.000000"),
            1U);
}

TEST_F(HoundWorker, StopCancelsWhatWasNeverOpenedButNothingBeforeAReply) {
  TalReportingSession& session = open(AudioServiceType::kAlarms);
  session.stop();
  session.start();
  reporter.accepts = false;
  for (int i = 0; i < 3; ++i) sendQuietAlarm(session);
  EXPECT_EQ(host.log.count("Hound session for alarm Low RMS failed to start."), 1U);
  session.stop();
  EXPECT_THAT(reporter.cancelled, IsEmpty());
  session.start();
  reporter.answer(MessageDict{{kHoundDiagReplyReason, 9}});
  for (int stops = 1; stops <= 2; ++stops) {
    session.stop();
    session.start();
    ASSERT_EQ(reporter.cancelled.size(), static_cast<std::size_t>(stops));
    EXPECT_EQ(reporter.cancelled.back().identifier, "NONE_RETURNED");
  }
}

TEST_F(HoundWorker, ExistsOnlyWhereItMay) {
  // In a single-message session neither of the session's own instances; the
  // haptic one only where the device asks for it.
  TalReportingSession& single = open(AudioServiceType::kAlarms, 42, true);
  for (int i = 0; i < 3; ++i) sendQuietAlarm(single);
  EXPECT_THAT(reporter.asked, IsEmpty());
  sendEnergylog(single, {{"System_Sound_Stuck_Time_Seconds", 1}});
  EXPECT_EQ(reporter.asked.size(), 1U);

  host.device_properties.properties.clear();
  TalReportingSession& without_haptics = open(AudioServiceType::kHaptics);
  for (int i = 0; i < 4; ++i) {
    sendEnergylog(without_haptics, {{"Haptic_Active_Hardware_Time_Seconds", i}});
  }
  EXPECT_EQ(reporter.asked.size(), 1U);

  host.platform.internal_build = false;
  EXPECT_EQ(open(AudioServiceType::kAlarms).workerInstanceCount(), 0U);
}

TEST_F(HoundWorker, RepliesAreReadByTheTable) {
  struct Row {
    std::optional<MessageDict> response;
    const char* identifier;
    std::vector<std::string> lines;
  };
  const std::string failed = "Failed starting hound session. ";
  std::vector<Row> rows{
      {MessageDict{{kHoundDiagReplySuccess, true}, {kHoundDiagReplySessionID, "x"}},
       "x",
       {"I Started Hound session. sessionId=x"}},
      {MessageDict{{kHoundDiagReplySuccess, true}},
       "NONE_RETURNED",
       {"E Started Hound session, but no sessionId found!"}},
      {std::nullopt,
       "NONE_RETURNED",
       {"E " + failed + "Unknown reason.", "E " + failed + "reason=kHoundDiagErrorNone"}},
      {MessageDict{{kHoundDiagReplySuccess, false}},
       "NONE_RETURNED",
       {"E " + failed + "Unknown reason.", "E " + failed + "reason=kHoundDiagErrorNone"}},
      {MessageDict{{kHoundDiagReplySuccess, "true"}, {kHoundDiagReplyReason, 0}},
       "NONE_RETURNED",
       {"E " + failed + "reason=kHoundDiagErrorNone"}},
      {MessageDict{{kHoundDiagReplyReason, 4711}}, "NONE_RETURNED", {"I " + failed + "reason=4711"}},
      {MessageDict{{kHoundDiagReplyReason, -1}}, "NONE_RETURNED", {"I " + failed + "reason=-1"}},
  };
  const std::vector<std::pair<HoundDiagError, const char*>> reasons{
      {kHoundDiagErrorServiceNotReady, "ServiceNotReady"},
      {kHoundDiagErrorNotSupported, "NotSupported"},
      {kHoundDiagErrorServiceUnavailable, "ServiceUnavailable"},
      {kHoundDiagErrorServiceInterrupted, "ServiceInterrupted"},
      {kHoundDiagErrorInvalidParameters, "InvalidParameters"},
      {kHoundDiagErrorDailyLimitExceeded, "DailyLimitExceeded"},
      {kHoundDiagErrorRandomizedSuppression, "RandomizedSuppression"},
      {kHoundDiagErrorSessionNotFound, "SessionNotFound"},
      {kHoundDiagErrorRequestThrottled, "RequestThrottled"}};
  for (const auto& [reason, name] : reasons) {
    rows.push_back(
        {MessageDict{{kHoundDiagReplySuccess, false}, {kHoundDiagReplyReason, std::int32_t{reason}}},
         "NONE_RETURNED",
         {"I " + failed + "reason=kHoundDiagError" + name}});
  }
  for (const Row& row : rows) {
    host.log.lines.clear();
    EXPECT_EQ(
        TalReportingSessionHoundWorker::getSessionIdentifierFromResponse(row.response, host.channels.hound),
        row.identifier);
    std::vector<std::string> lines;
    for (const auto& line : host.log.lines) {
      EXPECT_EQ(line.channel, "talrb");
      lines.push_back((line.level == LogLevel::kError ? "E " : "I ") + line.text);
    }
    EXPECT_EQ(lines, row.lines);
  }
}

}  // namespace
}  // namespace tal
