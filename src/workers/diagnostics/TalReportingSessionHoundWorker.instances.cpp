// The faults that are watched for. Named so that their log lines bear the name of
// the worker's class.

#include "workers/diagnostics/TalReportingSessionHoundWorker.h"

#include <chrono>
#include <mutex>
#include <utility>

#include "core/MessageKeys.h"
#include "workers/diagnostics/TalReportingHoundWorkerInstances.h"

namespace tal {

namespace {

using Leaks = TalReportingHoundWorkerInstanceLeaks;
using HoundWorker = TalReportingSessionHoundWorker;

constexpr std::string_view kHapticLeaks = "TalReportingHoundWorkerInstanceHapticLeaks";
constexpr std::string_view kSSSLeaks = "TalReportingHoundWorkerInstanceSSSLeaks";
constexpr std::string_view kAlarmLowRMS = "TalReportingHoundWorkerInstanceAlarmLowRMS";
constexpr std::string_view kAvvcDestroyRecordQueue = "TalReportingHoundWorkerInstanceAvvcDestroyRecordQueue";

constexpr Leaks::Fault kHapticFault{kHapticActiveHardwareTimeSeconds, AudioServiceType::kHaptics, "haptics"};
constexpr Leaks::Fault kSystemSoundFault{kSystemSoundStuckTimeSeconds, AudioServiceType::kSystemsounds,
                                         "system sound server"};

constexpr std::chrono::seconds kBetweenSystemSoundCaptures{15};

// Wherever a count is set, the durations have no effect; engineers read them as
// the time in which the fault is expected.
WorkerInstanceState hapticThresholds() {
  WorkerInstanceState state;
  state.interestThresholdCount = 2;
  state.interestThresholdDurationSeconds = 60.0;
  return state;
}

WorkerInstanceState systemSoundThresholds() {
  WorkerInstanceState state;
  state.interestThresholdCount = 1;
  return state;
}

WorkerInstanceState alarmThresholds() {
  WorkerInstanceState state;
  state.interestThresholdCount = 3;
  state.interestThresholdDurationSeconds = 15.0;
  state.oncePerSession = true;
  return state;
}

std::string textOf(const std::optional<MessageDict>& response) {
  return response ? response->text() : "(null)";
}

}  // namespace

bool TalReportingHoundWorkerInstanceLeaks::interestedInMessage(
    const TalReportingSessionMessage& message) const {
  return message.type() == AudioEventType::kEnergylog && message.message().contains(fault_.watched_key);
}

MessageDict TalReportingHoundWorkerInstanceLeaks::processIdentifierPayload() const {
  const auto& identifiers = session().processIdentifiers();
  const MessageDict processes{{kProcessIDs, MessageArray(identifiers.begin(), identifiers.end())}};
  return {{kHoundDiagKeyPayloadPKParameters, MessageDict{{kPKSysLogFilterProcess, processes}}}};
}

void TalReportingHoundWorkerInstanceLeaks::fire(const TalReportingSessionMessage& message) {
  SymptomReporterService& reporter = *workerState().symptomReporter;
  const bool accepted = reporter.snapshotWithSignature(
      {.signature =
           HoundWorker::signatureFromMessage(message, fault_.service_type, reporter, kUnknownApplicationName),
       .payload = processIdentifierPayload(),
       .reply = [state = sharedState(), &channel = log(),
                 words = fault_.words](const std::optional<MessageDict>& response) {
         std::string identifier = HoundWorker::getSessionIdentifierFromResponse(response, channel);
         TAL_LOG_INFO(channel, "Started Hound session for ", words, " leaks. sessionId=", identifier,
                      " response=", textOf(response));
         state->currentHoundSessionIdentifier = std::move(identifier);
       }});
  if (accepted) {
    TAL_LOG_INFO(log(), "Parameters to Hound session accepted.");
  } else {
    TAL_LOG_ERROR(log(), "Parameters to Hound session not accepted!");
  }
}

TalReportingHoundWorkerInstanceHapticLeaks::TalReportingHoundWorkerInstanceHapticLeaks(
    TalReportingSession& session, HoundInstanceRegistry& registry)
    : TalReportingHoundWorkerInstanceLeaks(session, registry.stateOf(kHapticLeaks, hapticThresholds()),
                                           kHapticFault) {}

TalReportingHoundWorkerInstanceSSSLeaks::TalReportingHoundWorkerInstanceSSSLeaks(
    TalReportingSession& session, HoundInstanceRegistry& registry)
    : TalReportingHoundWorkerInstanceLeaks(session, registry.stateOf(kSSSLeaks, systemSoundThresholds()),
                                           kSystemSoundFault),
      last_fire_(registry.systemSoundLeaksLastFire()) {}

void TalReportingHoundWorkerInstanceSSSLeaks::fire(const TalReportingSessionMessage& message) {
  const std::lock_guard lock(last_fire_.mutex);
  const Clock::Instant now = session().platform().clock.monotonic();
  if (last_fire_.time && now - *last_fire_.time < kBetweenSystemSoundCaptures) {
    TAL_LOG_INFO(log(), "Already fired ", kSSSLeaks, " recently.");
    return;
  }
  last_fire_.time = now;
  TalReportingHoundWorkerInstanceLeaks::fire(message);
}

TalReportingHoundWorkerInstanceAlarmLowRMS::TalReportingHoundWorkerInstanceAlarmLowRMS(
    TalReportingSession& session)
    : TalReportingHoundWorkerInstance(session, std::make_shared<WorkerInstanceState>(alarmThresholds())) {}

bool TalReportingHoundWorkerInstanceAlarmLowRMS::interestedInMessage(
    const TalReportingSessionMessage& message) const {
  if (message.category() != AudioEventCategory::kError || message.type() != AudioEventType::kIssueDetector) {
    return false;
  }
  const AudioServiceType service = session().serviceType();
  if (service != AudioServiceType::kAlarms && service != AudioServiceType::kTest) return false;
  const MessageValue* issue = message.message().find(TalReportingMessageKeyIssueType);
  return issue && issue->isString() && issue->string() == "LowRMS";
}

void TalReportingHoundWorkerInstanceAlarmLowRMS::fire(const TalReportingSessionMessage& message) {
  SymptomReporterService& reporter = *workerState().symptomReporter;
  const double duration = houndAlarmLowRmsDuration;
  const bool accepted = reporter.startSessionWithSignature(
      {.signature = HoundWorker::signatureFromMessage(message, session().serviceType(), reporter,
                                                      session().clientProcessName().value_or("")),
       .duration_seconds = duration,
       .reply = [state = sharedState(), &channel = log(),
                 duration](const std::optional<MessageDict>& response) {
         std::string identifier = HoundWorker::getSessionIdentifierFromResponse(response, channel);
         TAL_LOG_INFO(channel, "Started Hound session for alarm Low RMS. sessionId=", identifier,
                      " timeout=", duration, " response=", textOf(response));
         state->currentHoundSessionIdentifier = std::move(identifier);
       }});
  if (accepted) {
    TAL_LOG_INFO(
        log(), "Parameters to Hound session for alarm Low RMS accepted. Will fire if not cancelled. timeout=",
        duration, ".");
  } else {
    TAL_LOG_ERROR(log(), "Hound session for alarm Low RMS failed to start.");
  }
}

void TalReportingHoundWorkerInstanceAlarmLowRMS::stop() {
  // Not cleared afterwards, and passed on even where it stands for none: both
  // deliberate, the service knows which sessions are open.
  const auto& identifier = workerState().currentHoundSessionIdentifier;
  if (!identifier) return;
  TAL_LOG_INFO(log(), "Stop called. Cancelling Hound session for alarm Low RMS. sessionId=", *identifier,
               " timeout=", houndAlarmLowRmsDuration);
  workerState().symptomReporter->cancelSession(*identifier);
}

std::vector<TalReportingHoundWorkerInstanceClass> allHoundWorkerInstanceClasses() {
  using Instance = std::unique_ptr<TalReportingHoundWorkerInstance>;
  return {{.name = kHapticLeaks,
           .handleSingleMessageSession = true,
           .device_property = "HapticLeakCaptureOptIn",
           .initWithSession = [](TalReportingSession& session, HoundInstanceRegistry& registry) -> Instance {
             return std::make_unique<TalReportingHoundWorkerInstanceHapticLeaks>(session, registry);
           }},
          {.name = kAlarmLowRMS,
           .initWithSession = [](TalReportingSession& session, HoundInstanceRegistry&) -> Instance {
             return std::make_unique<TalReportingHoundWorkerInstanceAlarmLowRMS>(session);
           }},
          {.name = kAvvcDestroyRecordQueue,
           .initWithSession = [](TalReportingSession& session, HoundInstanceRegistry&) -> Instance {
             return std::make_unique<TalReportingHoundWorkerInstanceAvvcDestroyRecordQueue>(session);
           }},
          {.name = kSSSLeaks,
           .handleSingleMessageSession = true,
           .initWithSession = [](TalReportingSession& session, HoundInstanceRegistry& registry) -> Instance {
             return std::make_unique<TalReportingHoundWorkerInstanceSSSLeaks>(session, registry);
           }}};
}

}  // namespace tal
