#include "service/TalReportingService.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <utility>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

// Lives outside every client's map, so that no client can address the session by it.
constexpr ReporterID kSingleMessageReporterID = 1;

// The timer fires just after the time-out, so that a session that has been idle
// for exactly that long is found idle.
constexpr std::chrono::nanoseconds kTimerMargin = std::chrono::microseconds(1);

// A line with ten thousand sessions would tell a reader nothing more, and one is
// written at every start and stop.
constexpr std::size_t kMostSessionsInLine = 16;

std::string sessionsText(const std::vector<TalReportingSession*>& sessions) {
  std::string text = "[";
  for (std::size_t i = 0; i < std::min(sessions.size(), kMostSessionsInLine); ++i) {
    if (i != 0) text += ", ";
    text += sessions[i]->description();
  }
  if (sessions.size() > kMostSessionsInLine) {
    text += ", and " + std::to_string(sessions.size() - kMostSessionsInLine) + " more";
  }
  return text + ']';
}

double secondsOf(std::chrono::nanoseconds duration) {
  return std::chrono::duration<double>(duration).count();
}

}  // namespace

TalReportingService::TalReportingService(const Platform& platform, const WorkerRoster& roster,
                                         TalReportingSystemMonitor& system_monitor, Options options)
    : platform_(platform), roster_(roster), options_(std::move(options)) {
  system_monitor.initializeWithQueue(TalReportingUtilityGetReportingServerQueue(platform_));
}

TalReportingService::~TalReportingService() { TAL_LOG(log(), "destroying service"); }

TalReportingService::Client TalReportingService::shouldAcceptNewConnection(
    std::int32_t process_identifier, std::string_view connection,
    std::shared_ptr<const ClientIdentity> identity) {
  TAL_LOG(log(), "newConnection: ", connection);
  auto client =
      std::make_shared<TalReportingClientServerInstance>(process_identifier, *this, std::move(identity));
  platform_.reporting_queue.post([this, client] {
    clients_.push_back(client);
    client->setClientStartDate(platform_.clock.secondsSince1970());
    client->setClientProcessName(platform_.processes.processName(client->processIdentifier()));
  });
  return client;
}

void TalReportingService::interruptionHandler(const std::weak_ptr<TalReportingClientServerInstance>& client) {
  TAL_LOG(log(), "interruptionHandler: connection exited");
  if (const Client held = client.lock()) held->handleConnectionError();
}

void TalReportingService::invalidationHandler(const std::weak_ptr<TalReportingClientServerInstance>& client,
                                              std::int32_t process_identifier) {
  const Client held = client.lock();
  if (held) held->handleConnectionError();
  // Start date and name are filed on the queue, so they are read there too.
  platform_.reporting_queue.post(
      [this, held, process_identifier] { reportUptime(held, process_identifier); });
}

void TalReportingService::reportUptime(const Client& client, std::int32_t process_identifier) {
  const auto name = client ? client->clientProcessName() : std::nullopt;
  const std::string shown_name = client ? name.value_or("(null)") : "unknown";
  const auto start = client ? client->clientStartDate() : std::nullopt;
  const double now = platform_.clock.secondsSince1970();
  double seconds = -1;
  if (start) {
    seconds = std::abs(now - *start);
    // The words say the opposite of the condition; log readers match them as they are.
    if (*start > now) {
      TAL_LOG(log(), "clientStartDate is in the past. clientpid=", process_identifier,
              " clientprocessname=", shown_name);
    }
  } else {
    TAL_LOG(log(), "clientStartDate is nil. clientpid=", process_identifier,
            " clientprocessname=", shown_name);
  }
  TAL_LOG(log(), "invalidationHandler: connection exited process=", shown_name,
          " uptime_sec=", static_cast<std::int64_t>(seconds));
  if (!name) {
    TAL_LOG(log(), "clientProcessName is nil. clientpid=", process_identifier);
    return;
  }
  constexpr std::string_view kEvent = "org.vantle.talsys.talreportingclientuptime";
  if (!platform_.analytics.eventIsWanted(kEvent)) return;
  platform_.analytics.sendEventWithPayloadProvider(kEvent, [&name, seconds] {
    return MessageDict{{"processName", *name}, {"seconds", seconds}};
  });
}

TalReportingSession* TalReportingService::findReportingSessionForID(ReporterID reporter_id) {
  assertOnQueue(platform_.reporting_queue);
  if (reporter_id == 0 || !isReportingEnabled()) return nullptr;
  for (const Client& client : clients_) {
    const auto& sessions = client->clientReportingSessionMap();
    if (const auto found = sessions.find(reporter_id); found != sessions.end()) {
      TAL_LOG_INFO(log(), "found reporting session ", reporter_id, " for client ",
                   client->processIdentifier());
      return found->second.get();
    }
  }
  TAL_LOG_ERROR(log(), "failed to find reporting session ", reporter_id);
  return nullptr;
}

std::vector<TalReportingSession*> TalReportingService::findReportingSessionsForIDs(
    const std::vector<ReporterID>& reporter_ids) {
  assertOnQueue(platform_.reporting_queue);
  if (!reporter_ids.empty()) {
    std::vector<TalReportingSession*> found;
    for (const ReporterID reporter_id : reporter_ids) {
      if (reporter_id == 0) continue;
      if (TalReportingSession* session = findReportingSessionForID(reporter_id)) found.push_back(session);
    }
    return found;
  }
  std::vector<TalReportingSession*> active = getAllActiveReportingSessions();
  logReportingSessions();
  if (active.empty()) active.push_back(&retrieveSingleMessageSession());
  return active;
}

std::vector<TalReportingSession*> TalReportingService::getAllActiveReportingSessions() const {
  assertOnQueue(platform_.reporting_queue);
  std::vector<TalReportingSession*> active;
  for (const Client& client : clients_) {
    std::vector<TalReportingSession*> all;
    for (const auto& [reporter_id, session] : client->clientReportingSessionMap())
      all.push_back(session.get());
    TAL_LOG(log(), "sessions for client ", client->processIdentifier(), " : ", sessionsText(all));
    std::copy_if(all.begin(), all.end(), std::back_inserter(active),
                 [](const TalReportingSession* session) { return session->started(); });
  }
  return active;
}

void TalReportingService::removeClient(const TalReportingClientServerInstance& client) {
  assertOnQueue(platform_.reporting_queue);
  std::erase_if(clients_, [&client](const Client& held) { return held.get() == &client; });
}

void TalReportingService::logReportingSessions() const {
  if (!log().enabled(LogLevel::kDefault)) return;
  const auto active = getAllActiveReportingSessions();
  TAL_LOG(log(), active.size(), " active reporting session(s) ", sessionsText(active));
}

TalReportingSession& TalReportingService::retrieveSingleMessageSession() {
  // Broadcasts without end would keep the session, and all that it keeps, for ever.
  if (single_message_kept_bytes_ > options_.max_kept_bytes) dropSingleMessageSession();
  if (!single_message_session_) createSingleMessageSession();
  single_message_session_last_retrieved_ = platform_.clock.monotonic();
  return *single_message_session_;
}

void TalReportingService::createSingleMessageSession() {
  TAL_LOG(log(), "Creating singleMessageSession");
  TalReportingSession::Options options{.reporter_id = kSingleMessageReporterID,
                                       .process_identifiers = {platform_.processes.ownProcessIdentifier()}};
  single_message_session_ = std::make_unique<TalReportingSession>(std::move(options), platform_, roster_,
                                                                  single_message_kept_bytes_);
  // Only now, and deliberately so: the start-on-init workers already exist, the
  // memory log among them, which takes no part in such a session otherwise.
  single_message_session_->setIsSingleMessageSession(true);
  single_message_session_->setServiceType(AudioServiceType::kStandalone);
  single_message_session_->updateConfigurationWithContentsOfConfiguration(
      MessageDict{{TalReportingApplicationName, MessageValue::literal(kUnknownApplicationName)}});
  single_message_session_->start();
  queueStopSingleSession();
}

void TalReportingService::dropSingleMessageSession() {
  single_message_session_->stop();
  single_message_session_.reset();
  // The timer of the session that went must not end the next one early.
  ++single_message_generation_;
}

void TalReportingService::queueStopSingleSession() {
  platform_.reporting_queue.postAfter(options_.single_message_session_timeout + kTimerMargin,
                                      life_.guard([this, generation = single_message_generation_] {
                                        if (generation == single_message_generation_)
                                          singleMessageTimerFired();
                                      }));
}

void TalReportingService::singleMessageTimerFired() {
  const auto idle = platform_.clock.monotonic() - *single_message_session_last_retrieved_;
  const double timeout_seconds = secondsOf(options_.single_message_session_timeout);
  if (options_.single_message_session_timeout < idle) {
    TAL_LOG(log(), "Stopping singleMessageSession timeout=", timeout_seconds);
    dropSingleMessageSession();
  } else {
    TAL_LOG_DEBUG(log(), "Not stopping singleMessageSession timeSinceLastUsed=", secondsOf(idle),
                  " timeout=", timeout_seconds);
    queueStopSingleSession();
  }
}

void TalReportingService::stopAllSessions() {
  assertOnQueue(platform_.reporting_queue);
  for (const Client& client : clients_) client->stopAllSessions();
  if (single_message_session_) dropSingleMessageSession();
}

}  // namespace tal
