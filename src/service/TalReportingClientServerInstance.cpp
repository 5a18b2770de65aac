#include "service/TalReportingClientServerInstance.h"

#include <algorithm>
#include <utility>

#include "core/MessageKeys.h"
#include "service/TalReportingService.h"

namespace tal {

namespace {

std::string listText(const std::vector<ReporterID>& reporter_ids) {
  std::string text = "[";
  for (const ReporterID reporter_id : reporter_ids) {
    if (text.size() > 1) text += ", ";
    text += std::to_string(reporter_id);
  }
  return text + ']';
}

}  // namespace

TalReportingClientServerInstance::TalReportingClientServerInstance(
    std::int32_t process_identifier, TalReportingService& service,
    std::shared_ptr<const ClientIdentity> identity)
    : process_identifier_(process_identifier),
      identity_(std::move(identity)),
      delegate_(service),
      platform_(service.platform()) {
  TAL_LOG(log(), "new client with pid ", process_identifier_);
}

TalReportingClientServerInstance::~TalReportingClientServerInstance() {
  TAL_LOG(log(), "dealloc ", process_identifier_, " from the server client list");
}

TalReportingSession* TalReportingClientServerInstance::findReportingSessionForID(
    ReporterID reporter_id, bool across_all_clients) const {
  if (reporter_id == 0) return nullptr;
  const auto found = client_reporting_session_map_.find(reporter_id);
  if (found != client_reporting_session_map_.end()) return found->second.get();
  return across_all_clients ? delegate_.findReportingSessionForID(reporter_id) : nullptr;
}

TalReportingSession* TalReportingClientServerInstance::findOwn(ReporterID reporter_id) const {
  return findReportingSessionForID(reporter_id, /*across_all_clients=*/false);
}

TalReportingSession* TalReportingClientServerInstance::findAny(ReporterID reporter_id) const {
  return findReportingSessionForID(reporter_id, /*across_all_clients=*/true);
}

std::unique_ptr<TalReportingSession> TalReportingClientServerInstance::makeSession(ReporterID reporter_id) {
  TalReportingSession::Options options{
      .reporter_id = reporter_id, .process_identifiers = {process_identifier_}, .client_identity = identity_};
  return std::make_unique<TalReportingSession>(std::move(options), platform_, delegate_.roster(),
                                               kept_bytes_);
}

void TalReportingClientServerInstance::createReportingSession(ReporterID reporter_id,
                                                              const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "creating session for reporter ", reporter_id);
  trace(TraceCode::kClientCreate);
  auto session = makeSession(reporter_id);
  session->setClientProcessName(client_process_name_);
  client_reporting_session_map_[reporter_id] = std::move(session);
  TAL_LOG(log(), "session created for reporter ", reporter_id);
  reply(true);
}

void TalReportingClientServerInstance::setServiceType(AudioServiceType type, ReporterID reporter_id,
                                                      const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  const auto number = static_cast<std::uint16_t>(type);
  TAL_LOG_DEBUG(log(), "setting service type ", number, " for reporter ", reporter_id);
  if (TalReportingSession* session = findOwn(reporter_id)) {
    if (session->serviceType() == type) {
      session->setServiceType(type);
    } else {
      replaceSession(*session, type);
    }
  }
  TAL_LOG(log(), "service type ", number, " set for reporter  ", reporter_id);
  reply(true);
}

// Workers are chosen by service type at the start, so another type takes another
// session. The old one is neither stopped nor its held start reply answered.
void TalReportingClientServerInstance::replaceSession(const TalReportingSession& old, AudioServiceType type) {
  const ReporterID reporter_id = old.reporterID();
  auto session = makeSession(reporter_id);
  session->updateConfigurationWithContentsOfConfiguration(old.configuration());
  session->addPreviousValues(old.previousValues());
  session->setServiceType(type);
  client_reporting_session_map_[reporter_id] = std::move(session);
}

void TalReportingClientServerInstance::getServiceNameForReporterID(ReporterID reporter_id,
                                                                   const TypeReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "fetching seviceType");  // spelt so on purpose: log readers match it
  // Reporter 0 is answered twice, deliberately: clients rely on neither answer alone.
  if (reporter_id == 0) reply(AudioServiceType::kUnknown);
  const TalReportingSession* session = findAny(reporter_id);
  const AudioServiceType type = session ? session->serviceType() : AudioServiceType::kUnknown;
  reply(type);
  TAL_LOG(log(), "returning service type ", static_cast<std::uint16_t>(type), " for reporter  ", reporter_id);
}

void TalReportingClientServerInstance::setConfiguration(const std::optional<MessageDict>& configuration,
                                                        ReporterID reporter_id, const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "setting configuration");
  if (TalReportingSession* session = findOwn(reporter_id)) {
    session->updateConfigurationWithContentsOfConfiguration(configuration);
  }
  reply(true);
}

void TalReportingClientServerInstance::startReportingSessionForID(ReporterID reporter_id,
                                                                  const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "starting session for reporter ", reporter_id);
  trace(TraceCode::kClientStart);
  TalReportingSession* session = findOwn(reporter_id);
  if (!session) {
    reply(true);
    return;
  }
  // A second start is ignored without an answer, deliberately.
  if (session->started()) return;
  session->start();
  answerHeldStart(*session);
  session->setTransactionCompleteBlock(reply);
  // Automated tests on internal builds wait for the answer before they play.
  if (session->serviceType() == AudioServiceType::kTest && platform_.internal_build) reply(true);
  delegate_.logReportingSessions();
}

void TalReportingClientServerInstance::answerHeldStart(TalReportingSession& session) {
  const BoolReply held = session.transactionCompleteBlock();
  session.setTransactionCompleteBlock(nullptr);
  if (held) held(true);
}

void TalReportingClientServerInstance::stopReportingSessionForID(ReporterID reporter_id,
                                                                 const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "stopping session for reporter ", reporter_id);
  trace(TraceCode::kClientStop);
  if (reporter_id == 0) {
    reply(true);
    return;
  }
  TalReportingSession* session = findOwn(reporter_id);
  if (session && session->started()) {
    session->stop();
    answerHeldStart(*session);
    delegate_.logReportingSessions();
  } else {
    TAL_LOG_DEBUG(log(), "Stop called, but session==nil or session.started==false. reporterID=", reporter_id,
                  " session=", session ? session->description() : "(null)",
                  " session.started=", session && session->started());
  }
  TAL_LOG(log(), "stopping ", reporter_id);
  reply(true);
}

void TalReportingClientServerInstance::destroyReportingSession(ReporterID reporter_id,
                                                               const BoolReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "destroying session for reporter ", reporter_id);
  trace(TraceCode::kClientDestroy);
  if (TalReportingSession* session = findOwn(reporter_id)) {
    if (session->started()) session->stop();
    // The held start reply goes with the session, unanswered.
    client_reporting_session_map_.erase(reporter_id);
  }
  TAL_LOG(log(), "destroying ", reporter_id);
  delegate_.logReportingSessions();
  reply(true);
}

void TalReportingClientServerInstance::validateReporterID(ReporterID reporter_id, const DictReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "validating reporter ", reporter_id);
  MessageDict answer{
      {TalReportingReplyKeyReporterID, 0},
      {TalReportingReplyKeyServiceType, static_cast<std::uint16_t>(AudioServiceType::kUnknown)}};
  if (const TalReportingSession* session = findAny(reporter_id)) {
    answer.set(TalReportingReplyKeyReporterID, reporter_id);
    answer.set(TalReportingReplyKeyServiceType, static_cast<std::uint16_t>(session->serviceType()));
  }
  TAL_LOG(log(), "validating reporter ", reporter_id);
  reply(std::move(answer));
}

void TalReportingClientServerInstance::getAllReporters(const ListReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  std::vector<ReporterID> reporters;
  for (const auto& client : delegate_.getAllClients()) {
    for (const auto& [reporter_id, session] : client->client_reporting_session_map_) {
      reporters.push_back(reporter_id);
    }
  }
  reply(std::move(reporters));
}

void TalReportingClientServerInstance::killService() {
  TAL_LOG(log(), "DESTROYING SERVICE");
  delegate_.options().end_process();
}

void TalReportingClientServerInstance::prepareMessage(MessageDict& message,
                                                      const std::vector<ReporterID>& reporter_ids) const {
  if (platform_.internal_build && delegate_.isReportingEnabled() && reporter_ids.empty()) {
    message.set(TalReportingMessageKeySendSingleMessage, 1);
  }
}

void TalReportingClientServerInstance::sendMessage(MessageDict message, AudioEventCategory category,
                                                   AudioEventType type,
                                                   const std::vector<ReporterID>& reporter_ids,
                                                   const ErrorReply& reply) {
  assertOnQueue(platform_.reporting_queue);
  TAL_LOG_DEBUG(log(), "sending message for reporter ", listText(reporter_ids));
  trace(TraceCode::kClientSendMessage);
  if (!delegate_.isReportingEnabled()) {
    reply(ReportingError::kReportingDisabled);
    return;
  }
  const auto sessions = delegate_.findReportingSessionsForIDs(reporter_ids);
  if (keepsTooMuch(sessions)) {
    reply(ReportingError::kKeepsTooMuch);
    return;
  }
  for (std::size_t i = 0; i < sessions.size(); ++i) {
    // Every session gets a record of its own; the last one can have the original.
    // Moved on the last turn only. NOLINTNEXTLINE(bugprone-use-after-move)
    MessageDict own = i + 1 == sessions.size() ? std::move(message) : message;
    sessions[i]->sendMessage(TalReportingSessionMessage::initWithMessage(std::move(own), category, type));
  }
  reply(std::nullopt);
}

// A message for another client's session counts there: refusing it keeps one
// client from filling another's memory through a broadcast.
bool TalReportingClientServerInstance::keepsTooMuch(const std::vector<TalReportingSession*>& sessions) const {
  const std::size_t most = delegate_.options().max_kept_bytes;
  return kept_bytes_ > most || std::any_of(sessions.begin(), sessions.end(), [most](const auto* session) {
           return session->ownerBytes() > most;
         });
}

void TalReportingClientServerInstance::handleConnectionError() {
  platform_.reporting_queue.post([self = shared_from_this()] { self->connectionEnded(); });
}

void TalReportingClientServerInstance::stopAllSessions() {
  assertOnQueue(platform_.reporting_queue);
  for (const auto& [reporter_id, session] : client_reporting_session_map_) {
    if (session->started()) session->stop();
  }
}

void TalReportingClientServerInstance::connectionEnded() {
  const auto& clients = delegate_.getAllClients();
  const bool known =
      std::any_of(clients.begin(), clients.end(), [this](const auto& c) { return c.get() == this; });
  if (!known) return;
  stopAllSessions();
  client_reporting_session_map_.clear();
  delegate_.removeClient(*this);
  TAL_LOG(log(), "removing ", process_identifier_, " from the server client list");
}

}  // namespace tal
