#pragma once

// One client connection: the operations that a client may ask for, and the
// sessions that it created.

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"
#include "platform/ClientIdentity.h"
#include "session/TalReportingSession.h"

namespace tal {

class TalReportingService;

/// Why an operation was refused.
enum class ReportingError {
  kReportingDisabled,  ///< domain "org.vantle.audio.reporting", code 1
  kKeepsTooMuch,       ///< the sessions keep more than they may; nothing was done
};

/// One per accepted connection. Every method lives on the reporting queue unless
/// it says otherwise; the transport posts to the queue, in batches.
///
/// A reply callback is called as the method says: mostly once before the method
/// returns; a start reply is held until the session stops or starts again, which
/// may be never. Callbacks must not call back into the service.
class TalReportingClientServerInstance
    : public std::enable_shared_from_this<TalReportingClientServerInstance> {
 public:
  using BoolReply = std::function<void(bool)>;
  using TypeReply = std::function<void(AudioServiceType)>;
  using DictReply = std::function<void(MessageDict)>;
  using ListReply = std::function<void(std::vector<ReporterID>)>;
  using ErrorReply = std::function<void(std::optional<ReportingError>)>;
  /// The sessions by ID, ascending.
  using SessionMap = std::map<ReporterID, std::unique_ptr<TalReportingSession>>;

  /// Held by a shared pointer. `service` (the delegate) outlives the instance.
  /// Without an identity the client's sessions may open no files.
  TalReportingClientServerInstance(std::int32_t process_identifier, TalReportingService& service,
                                   std::shared_ptr<const ClientIdentity> identity = nullptr);
  TalReportingClientServerInstance(const TalReportingClientServerInstance&) = delete;
  TalReportingClientServerInstance& operator=(const TalReportingClientServerInstance&) = delete;
  ~TalReportingClientServerInstance();

  void createReportingSession(ReporterID reporter_id, const BoolReply& reply);
  void setServiceType(AudioServiceType type, ReporterID reporter_id, const BoolReply& reply);
  /// Answers the type's number; for reporter 0 twice.
  void getServiceNameForReporterID(ReporterID reporter_id, const TypeReply& reply);
  void setConfiguration(const std::optional<MessageDict>& configuration, ReporterID reporter_id,
                        const BoolReply& reply);
  void startReportingSessionForID(ReporterID reporter_id, const BoolReply& reply);

  /// Any thread: what must be known of a message before it is posted to the
  /// queue. On an internal build a message without reporter IDs is marked with
  /// "sendSingleMessage".
  void prepareMessage(MessageDict& message, const std::vector<ReporterID>& reporter_ids) const;
  /// The message has been prepared. An empty list of IDs is a broadcast.
  void sendMessage(MessageDict message, AudioEventCategory category, AudioEventType type,
                   const std::vector<ReporterID>& reporter_ids, const ErrorReply& reply);

  void stopReportingSessionForID(ReporterID reporter_id, const BoolReply& reply);
  void destroyReportingSession(ReporterID reporter_id, const BoolReply& reply);
  /// "reporterID:valid:".
  void validateReporterID(ReporterID reporter_id, const DictReply& reply);
  void getAllReporters(const ListReply& reply);
  /// Any thread. Ends the process; see `TalReportingService::Options`.
  void killService();

  /// Any thread: the connection has ended. Posts to the reporting queue: started
  /// sessions are stopped, held start replies stay unanswered, and the client
  /// leaves the service's list. A second call finds nothing to do.
  void handleConnectionError();

  /// Stops every started session, answering no held start reply.
  void stopAllSessions();

  std::int32_t processIdentifier() const { return process_identifier_; }
  std::optional<double> clientStartDate() const { return client_start_date_; }
  void setClientStartDate(double seconds_since_1970) { client_start_date_ = seconds_since_1970; }
  const std::optional<std::string>& clientProcessName() const { return client_process_name_; }
  void setClientProcessName(std::optional<std::string> name) { client_process_name_ = std::move(name); }
  const SessionMap& clientReportingSessionMap() const { return client_reporting_session_map_; }

  /// Memory that the kept messages of this client's sessions hold.
  std::size_t keptBytes() const { return kept_bytes_; }

 private:
  const LogChannel& log() const { return platform_.log.service; }
  void trace(TraceCode code) const { platform_.trace_points.emit(code); }
  TalReportingSession* findOwn(ReporterID reporter_id) const;
  TalReportingSession* findAny(ReporterID reporter_id) const;
  TalReportingSession* findReportingSessionForID(ReporterID reporter_id, bool across_all_clients) const;
  std::unique_ptr<TalReportingSession> makeSession(ReporterID reporter_id);
  void replaceSession(const TalReportingSession& old, AudioServiceType type);
  static void answerHeldStart(TalReportingSession& session);
  bool keepsTooMuch(const std::vector<TalReportingSession*>& sessions) const;
  void connectionEnded();

  const std::int32_t process_identifier_;
  const std::shared_ptr<const ClientIdentity> identity_;
  TalReportingService& delegate_;
  const Platform& platform_;
  std::optional<double> client_start_date_;
  std::optional<std::string> client_process_name_;
  std::size_t kept_bytes_ = 0;
  SessionMap client_reporting_session_map_;
};

}  // namespace tal
