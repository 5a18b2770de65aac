#pragma once

// The daemon's one long-lived object: accepts connections, finds sessions across
// clients, and owns the session for messages that nobody's session is open for.

#include <atomic>
#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/LifeToken.h"
#include "platform/Platform.h"
#include "service/TalReportingClientServerInstance.h"
#include "session/TalReportingSession.h"
#include "session/WorkerRoster.h"
#include "system/TalReportingSystemMonitor.h"

namespace tal {

/// Lives on the reporting queue, but for the operations that say otherwise.
class TalReportingService {
 public:
  struct Options {
    /// Ends the process with exit status 2, after the rows already handed to the
    /// store are committed. Called on the thread of the connection.
    std::function<void()> end_process = {};
    /// Most memory that the kept messages of one connection's sessions may hold.
    std::size_t max_kept_bytes = std::size_t{256} << 20;
    std::chrono::nanoseconds single_message_session_timeout = std::chrono::seconds(5);
  };
  using Client = std::shared_ptr<TalReportingClientServerInstance>;

  /// Initialises `system_monitor` with the reporting queue, before any session
  /// exists. It, `platform` and `roster` outlive the service.
  TalReportingService(const Platform& platform, const WorkerRoster& roster,
                      TalReportingSystemMonitor& system_monitor, Options options);
  TalReportingService(const TalReportingService&) = delete;
  TalReportingService& operator=(const TalReportingService&) = delete;
  ~TalReportingService();

  /// The transport's thread: takes in a connection of the process and posts the
  /// rest of its joining to the reporting queue. The transport holds the client
  /// until the connection ends, then calls the invalidation handler (where the
  /// peer broke off in mid-frame, the interruption handler first) and lets go.
  /// `connection` is how log lines call it; `identity` decides which files the
  /// client may have opened, none when it is null.
  Client shouldAcceptNewConnection(std::int32_t process_identifier, std::string_view connection,
                                   std::shared_ptr<const ClientIdentity> identity = nullptr);

  /// The transport's thread: the connection broke off.
  void interruptionHandler(const std::weak_ptr<TalReportingClientServerInstance>& client);
  /// The transport's thread: the connection is over. Stops the client's sessions
  /// and sends the client's uptime as an analytics event.
  void invalidationHandler(const std::weak_ptr<TalReportingClientServerInstance>& client,
                           std::int32_t process_identifier);

  /// The session under the ID, of the client that connected first; null for 0,
  /// for an unknown ID and while reporting is disabled.
  TalReportingSession* findReportingSessionForID(ReporterID reporter_id);
  /// The sessions named; for an empty list every started session, or else the
  /// single-message session. The pointers are valid until the next operation.
  std::vector<TalReportingSession*> findReportingSessionsForIDs(const std::vector<ReporterID>& reporter_ids);
  std::vector<TalReportingSession*> getAllActiveReportingSessions() const;
  const std::vector<Client>& getAllClients() const { return clients_; }
  void removeClient(const TalReportingClientServerInstance& client);
  void logReportingSessions() const;

  /// Any thread.
  bool isReportingEnabled() const { return reporting_enabled_.load(std::memory_order_relaxed); }
  /// Nothing in the system calls it after construction.
  void setReportingEnabled(bool enabled) { reporting_enabled_.store(enabled, std::memory_order_relaxed); }

  /// Orderly end: stops every started session as on the loss of its connection,
  /// the single-message session included.
  void stopAllSessions();

  const Platform& platform() const { return platform_; }
  const WorkerRoster& roster() const { return roster_; }
  const Options& options() const { return options_; }
  TalReportingSession* singleMessageSession() const { return single_message_session_.get(); }

 private:
  const LogChannel& log() const { return platform_.log.service; }
  TalReportingSession& retrieveSingleMessageSession();
  void createSingleMessageSession();
  void dropSingleMessageSession();
  void queueStopSingleSession();
  void singleMessageTimerFired();
  void reportUptime(const Client& client, std::int32_t process_identifier);

  const Platform& platform_;
  const WorkerRoster& roster_;
  const Options options_;
  std::atomic<bool> reporting_enabled_{true};
  std::vector<Client> clients_;
  std::size_t single_message_kept_bytes_ = 0;
  std::unique_ptr<TalReportingSession> single_message_session_;
  std::uint64_t single_message_generation_ = 0;
  std::optional<Clock::Instant> single_message_session_last_retrieved_;
  LifeToken life_;
};

}  // namespace tal
