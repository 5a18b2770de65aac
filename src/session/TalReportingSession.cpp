#include "session/TalReportingSession.h"

#include <algorithm>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

std::string_view yesOrNo(bool value) { return value ? "YES" : "NO"; }

}  // namespace

TalReportingSession::TalReportingSession(Options options, const Platform& platform,
                                         const WorkerRoster& roster, std::size_t& owner_bytes)
    : platform_(platform),
      roster_(roster),
      owner_bytes_(owner_bytes),
      reporter_id_(options.reporter_id),
      process_identifiers_(std::move(options.process_identifiers)),
      client_identity_(std::move(options.client_identity)),
      kept_(owner_bytes) {
  startWorkersFromClasses(roster_.startOnInitClasses());
  TAL_LOG_INFO(log(), "created reporting session for ID: ", reporter_id_);
  platform_.trace_points.emit(TraceCode::kSessionCreated);
}

TalReportingSession::~TalReportingSession() {
  owner_bytes_ -= previous_values_bytes_;
  platform_.trace_points.emit(TraceCode::kSessionDestroyed);
  TAL_LOG_INFO(log(), "deallocing this session ", reporter_id_);
}

void TalReportingSession::setServiceType(AudioServiceType type) {
  assertOnQueue(platform_.reporting_queue);
  service_type_ = type;
  service_name_ = TalReportingUtilityGenerateServiceNameFromServiceType(type);
  TAL_LOG_INFO(log(), "setting service type ", service_name_);
}

void TalReportingSession::updateConfigurationWithContentsOfConfiguration(
    const std::optional<MessageDict>& configuration) {
  assertOnQueue(platform_.reporting_queue);
  if (!configuration) return;
  if (const MessageValue* name = configuration->find(TalReportingConfigurationApplicationName)) {
    configuration_.set(TalReportingApplicationName, *name);
  }
  configuration_.merge(*configuration);
}

void TalReportingSession::recordStateMessage(AudioEventType type) {
  const bool starting = type == AudioEventType::kStart;
  const std::size_t count = kept_.messages().size();
  MessageDict state{
      {"method", MessageValue::literal(starting ? "start" : "stop")},
      {starting ? "messages_at_start" : "messages_at_stop", static_cast<std::int64_t>(count)},
      // The same number under both keys, which readers of the reports rely on.
      {starting ? "unique_messages_at_start" : "unique_messages_at_stop", static_cast<std::uint64_t>(count)},
      {"reporterid", reporter_id_},
      {starting ? "running_at_start" : "running_at_stop", MessageValue::literal(yesOrNo(started_))}};
  auto message =
      TalReportingSessionMessage::initWithMessage(std::move(state), AudioEventCategory::kSetup, type);
  addMissingDates(*message, platform_.clock.secondsSince1970());
  addAudioMessageTag(*message);
  kept_.append(std::move(message));
}

void TalReportingSession::start() {
  assertOnQueue(platform_.reporting_queue);
  recordStateMessage(AudioEventType::kStart);
  TAL_LOG_INFO(log(), "start called. reporterID=", reporter_id_);
  if (started_) {
    TAL_LOG_INFO(log(), reporter_id_, " is already started");
    return;
  }
  TAL_LOG_DEBUG(log(), "self.started==false. starting. reporterID=", reporter_id_);
  started_ = true;
  platform_.trace_points.emit(TraceCode::kSessionStarted);
  startWorkersFromClasses(roster_.validClasses());
}

void TalReportingSession::stop() {
  assertOnQueue(platform_.reporting_queue);
  recordStateMessage(AudioEventType::kStop);
  TAL_LOG_DEBUG(log(), "stop called. reporterID=", reporter_id_);
  if (!started_) return;
  TAL_LOG_DEBUG(log(), "ending session. reporterID=", reporter_id_);
  platform_.trace_points.emit(TraceCode::kSessionEnding);
  kept_.sort();
  // Producers first: what they derive must reach the consumers before these stop.
  for (WorkerInstance* instance : workersGrouped(/*producers_first=*/true)) {
    if (!instance->worker->started()) continue;
    instance->worker->stop();
    instance->worker->setStarted(false);
    TAL_LOG_DEBUG(log(), "TalReportingSessionWorker action=stop worker=", instance->worker_class->name(),
                  " reporterID=", reporter_id_);
  }
  kept_.clear();
  countPreviousValues();
  total_message_count_ = 0;
  started_ = false;
}

// While messages are kept they share the values, which are counted with them.
void TalReportingSession::countPreviousValues() {
  owner_bytes_ -= previous_values_bytes_;
  previous_values_bytes_ = previous_values_.footprintBytes();
  owner_bytes_ += previous_values_bytes_;
}

// A worker that is in both groups keeps its first place.
std::vector<TalReportingSession::WorkerInstance*> TalReportingSession::workersGrouped(bool producers_first) {
  std::vector<WorkerInstance*> ordered;
  ordered.reserve(message_workers_.size());
  const auto add = [&ordered](WorkerInstance* instance) {
    if (std::find(ordered.begin(), ordered.end(), instance) == ordered.end()) ordered.push_back(instance);
  };
  const auto& first = producers_first ? producing_message_workers_ : consuming_message_workers_;
  const auto& second = producers_first ? consuming_message_workers_ : producing_message_workers_;
  std::for_each(first.begin(), first.end(), add);
  std::for_each(second.begin(), second.end(), add);
  for (const auto& instance : message_workers_) add(instance.get());
  return ordered;
}

bool TalReportingSession::isInitialized(const TalReportingSessionWorkerClass& worker_class) const {
  return std::any_of(message_workers_.begin(), message_workers_.end(),
                     [&](const auto& instance) { return instance->worker_class == &worker_class; });
}

void TalReportingSession::startWorkersFromClasses(const WorkerRoster::Classes& classes) {
  for (TalReportingSessionWorkerClass* worker_class : classes) createWorker(*worker_class);
  // Consumers first: what a producer emits as it starts must not be lost.
  for (WorkerInstance* instance : workersGrouped(/*producers_first=*/false)) startWorker(*instance);
}

void TalReportingSession::createWorker(TalReportingSessionWorkerClass& worker_class) {
  const std::string_view name = worker_class.name();
  if (is_single_message_session_ && !worker_class.handleSingleMessageSession()) {
    TAL_LOG_DEBUG(
        log(), "Skipping TalReportingSessionWorker for single message session. action=skipped worker=", name,
        " reporterID=", reporter_id_);
    return;
  }
  if (isInitialized(worker_class)) {
    TAL_LOG_DEBUG(log(), "TalReportingSessionWorker already initialized. action=skipped worker=", name,
                  " reporterID=", reporter_id_);
    return;
  }
  TAL_LOG_DEBUG(log(), "Initializing TalReportingSessionWorker. action=init worker=", name,
                " reporterID=", reporter_id_);
  std::unique_ptr<TalReportingSessionWorker> worker = worker_class.initWithSession(*this);
  if (!worker) {
    TAL_LOG_DEBUG(log(), "TalReportingSessionWorker failed to initialize. action=failure worker=", name,
                  " reporterID=", reporter_id_);
    return;
  }
  TalReportingSessionWorkerConsumer* consumer = worker->asConsumer();
  const bool handles_redundant = consumer && consumer->handleRedundantMessages();
  message_workers_.push_back(std::make_unique<WorkerInstance>(
      WorkerInstance{&worker_class, std::move(worker), consumer, handles_redundant}));
  WorkerInstance* instance = message_workers_.back().get();
  if (worker_class.isConsumer() && consumer) consuming_message_workers_.push_back(instance);
  if (worker_class.isProducer()) producing_message_workers_.push_back(instance);
  TAL_LOG_DEBUG(log(), "TalReportingSessionWorker action=added worker=", name, " reporterID=", reporter_id_);
}

void TalReportingSession::startWorker(WorkerInstance& instance) {
  if (instance.worker->started()) return;
  const std::optional<bool> answer = instance.worker->start();
  instance.worker->setStarted(answer.value_or(true));
  if (!answer) return;
  TAL_LOG_DEBUG(log(), "TalReportingSessionWorker action=start worker=", instance.worker_class->name(),
                " started=", yesOrNo(*answer), " reporterID=", reporter_id_);
}

std::string TalReportingSession::description() const {
  std::string text = "reporterID=" + std::to_string(reporter_id_);
  text += ",serviceName=";
  text += service_name_;
  text += ",ownerPid=" + std::to_string(process_identifiers_.empty() ? 0 : process_identifiers_.front());
  text += ",clientProcessName=" + client_process_name_.value_or("(null)");
  text += ",HostApplicationDisplayID=" + TalReportingUtilityRetrieveAppName(configuration_).text();
  text += started_ ? ",started=1" : ",started=0";
  text += is_single_message_session_ ? ",singleMessageSession=1" : ",singleMessageSession=0";
  return text;
}

}  // namespace tal
