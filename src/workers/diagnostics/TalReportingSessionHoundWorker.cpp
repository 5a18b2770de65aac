#include "workers/diagnostics/TalReportingSessionHoundWorker.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "workers/diagnostics/TalReportingHoundWorkerInstances.h"

namespace tal {

namespace {

// What a capture tells of its session: so many messages, in so much memory, that
// gathering them is not felt on the reporting queue.
constexpr std::size_t kMostContextMessages = 200;
constexpr std::size_t kMostContextBytes = std::size_t{1} << 20;

void logRefusal(std::int64_t reason, const LogChannel& log) {
  const bool named = reason >= 0 && static_cast<std::size_t>(reason) < kHoundDiagErrorNames.size();
  const std::string name =
      named ? std::string(kHoundDiagErrorNames[static_cast<std::size_t>(reason)]) : std::to_string(reason);
  const LogLevel level = reason == kHoundDiagErrorNone ? LogLevel::kError : LogLevel::kInfo;
  TAL_LOG_AT(log, level, "Failed starting hound session. reason=", name);
}

}  // namespace

TalReportingSessionHoundWorkerClass::TalReportingSessionHoundWorkerClass()
    : TalReportingSessionHoundWorkerClass(allHoundWorkerInstanceClasses()) {}

TalReportingSessionHoundWorkerClass::TalReportingSessionHoundWorkerClass(InstanceClasses instance_classes)
    : TalReportingSessionWorkerClass("TalReportingSessionHoundWorker",
                                     {.is_consumer = true, .handle_single_message_session = true}),
      instance_classes_(std::move(instance_classes)) {}

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionHoundWorkerClass::initWithSession(
    TalReportingSession& session) {
  SymptomReporterFactory* reporters = session.platform().symptom_reporters;
  if (!session.platform().internal_build || !reporters) return nullptr;
  return std::make_unique<TalReportingSessionHoundWorker>(session, *reporters, instance_classes_, registry_);
}

TalReportingSessionHoundWorker::TalReportingSessionHoundWorker(TalReportingSession& session,
                                                               SymptomReporterFactory& reporters,
                                                               const InstanceClasses& instance_classes,
                                                               HoundInstanceRegistry& registry)
    : session_(session), reporters_(reporters) {
  const DeviceProperties& device = session.platform().device_properties;
  for (const auto& instance_class : instance_classes) {
    const std::string_view property = instance_class.device_property;
    if (property.empty() || device.booleanProperty(property).value_or(false)) {
      addInstance(instance_class, registry);
    }
  }
}

void TalReportingSessionHoundWorker::addInstance(const TalReportingHoundWorkerInstanceClass& instance_class,
                                                 HoundInstanceRegistry& registry) {
  if (session_.isSingleMessageSession() && !instance_class.handleSingleMessageSession) return;
  if (auto instance = instance_class.initWithSession(session_, registry)) {
    instances_.push_back({instance_class.name, std::move(instance)});
  }
}

std::optional<bool> TalReportingSessionHoundWorker::start() {
  for (const Instance& each : instances_) each.instance->start();
  return true;
}

void TalReportingSessionHoundWorker::stop() {
  for (const Instance& each : instances_) each.instance->stop();
}

bool TalReportingSessionHoundWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (!message) return false;
  for (const Instance& each : instances_) offer(each, *message);
  return false;
}

// The order of the steps is what its readers rely on: a repeat is never counted
// twice, and every fire, one that is not carried out too, begins a new count.
void TalReportingSessionHoundWorker::offer(const Instance& each, const TalReportingSessionMessage& message) {
  TalReportingHoundWorkerInstance& instance = *each.instance;
  WorkerInstanceState& state = instance.workerState();
  if (state.lastMessage && *state.lastMessage == message.message()) return;
  if (!instance.interestedInMessage(message)) return;
  TAL_LOG_DEBUG(log(), "Interested in message. instance=", each.class_name, ", ", message.description());
  ++state.interestedCount;
  if (!state.interestFirstSeen) state.interestFirstSeen = session_.platform().clock.monotonic();
  instance.handleMessage(message);
  state.lastMessage = message.message();
  if (!instance.implementsFire() || !thresholdIsReached(state)) return;
  // The counters stay as they are here.
  if (state.firedCount > 0 && state.oncePerSession) return;
  fire(instance, message);
  state.lastMessage.reset();
  state.interestFirstSeen.reset();
  state.interestedCount = 0;
}

// Deliberately unequal: the duration counts only where no number of messages is
// asked for.
bool TalReportingSessionHoundWorker::thresholdIsReached(const WorkerInstanceState& state) const {
  if (state.interestedCount < state.interestThresholdCount) return false;
  if (state.interestThresholdCount != 0) return true;
  const std::chrono::duration<double> elapsed =
      session_.platform().clock.monotonic() - *state.interestFirstSeen;
  return elapsed.count() > state.interestThresholdDurationSeconds;
}

void TalReportingSessionHoundWorker::fire(TalReportingHoundWorkerInstance& instance,
                                          const TalReportingSessionMessage& message) {
  WorkerInstanceState& state = instance.workerState();
  state.symptomReporter = reporters_.makeClient(context());
  ++state.firedCount;
  if (session_.serviceType() == AudioServiceType::kTest) {
    TAL_LOG_INFO(log(), "Skipping actual fire, as we are running in test mode.");
    return;
  }
  instance.fire(message);
}

SymptomContext TalReportingSessionHoundWorker::context() const {
  SymptomContext context{.session = session_.description(), .last_messages = {}};
  std::size_t bytes = 0;
  const auto& messages = session_.messages();
  for (auto it = messages.rbegin(); it != messages.rend(); ++it) {
    const TalReportingSessionMessage& message = **it;
    bytes += message.message().footprintBytes();
    if (context.last_messages.size() == kMostContextMessages || bytes > kMostContextBytes) break;
    context.last_messages.push_back({message.category(), message.type(), message.message()});
  }
  std::reverse(context.last_messages.begin(), context.last_messages.end());
  return context;
}

SymptomReporterService::Signature TalReportingSessionHoundWorker::signatureFromMessage(
    const TalReportingSessionMessage& message, AudioServiceType audio_service_type,
    SymptomReporterService& symptom_reporter, std::string_view client_process_name) {
  return symptom_reporter.signatureWithDomain(
      {.domain = "Sonarium",
       .type = TalReportingUtilityGenerateServiceNameFromServiceType(audio_service_type),
       .sub_type = TalReportingUtilityCategoryString(message.category()),
       .subtype_context = TalReportingUtilityTypeString(message.type()),
       .detected_process = client_process_name});
}

std::string TalReportingSessionHoundWorker::getSessionIdentifierFromResponse(
    const std::optional<MessageDict>& response, const LogChannel& log) {
  std::string none(kNoHoundSessionReturned);
  const auto find = [&response](const MessageKey& key) { return response ? response->find(key) : nullptr; };
  const MessageValue* success = find(kHoundDiagReplySuccess);
  if (success && *success == MessageValue(true)) {
    const MessageValue* identifier = find(kHoundDiagReplySessionID);
    if (!identifier) {
      TAL_LOG_ERROR(log, "Started Hound session, but no sessionId found!");
      return none;
    }
    std::string text = identifier->text();
    TAL_LOG_INFO(log, "Started Hound session. sessionId=", text);
    return text;
  }
  const MessageValue* reason = find(kHoundDiagReplyReason);
  if (!reason) TAL_LOG_ERROR(log, "Failed starting hound session. Unknown reason.");
  logRefusal(reason ? reason->toInt64() : std::int64_t{kHoundDiagErrorNone}, log);
  return none;
}

}  // namespace tal
