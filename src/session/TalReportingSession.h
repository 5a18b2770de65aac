#pragma once

// One client's reporting context: its configuration, what kind of client it is,
// the messages kept, a running merge of all values, and its workers.

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"
#include "core/TalReportingSessionMessage.h"
#include "platform/ClientIdentity.h"
#include "platform/Platform.h"
#include "session/KeptMessages.h"
#include "session/TalReportingSessionWorker.h"
#include "session/WorkerRoster.h"

namespace tal {

/// A reporting session. Lives on the reporting queue.
///
/// Life:
/// 1. created: the start-on-init workers run, messages are taken in and kept;
/// 2. `start`: all workers run;
/// 3. `stop`: producers, then consumers, then the rest are stopped; the kept
///    messages are cleared; workers, configuration and previous values remain;
/// 4. started again, any number of times;
/// 5. destroyed: stops nothing and answers nobody; the workers end with it.
class TalReportingSession {
 public:
  using StartReply = std::function<void(bool)>;

  struct Options {
    ReporterID reporter_id = 0;
    /// The owning processes; the first is the owner.
    std::vector<std::int32_t> process_identifiers;
    /// Who the client is to the host; null for nobody, who has no rights.
    std::shared_ptr<const ClientIdentity> client_identity = nullptr;
  };

  /// `platform`, `roster` and `owner_bytes` outlive the session. `owner_bytes` is
  /// the owner's count of the memory that its sessions' messages hold: those kept,
  /// and after a stop what remains of them as previous values.
  TalReportingSession(Options options, const Platform& platform, const WorkerRoster& roster,
                      std::size_t& owner_bytes);
  TalReportingSession(const TalReportingSession&) = delete;
  TalReportingSession& operator=(const TalReportingSession&) = delete;
  ~TalReportingSession();

  void setServiceType(AudioServiceType type);

  /// Merges the dictionary into the configuration; null does nothing. The value
  /// of "RvHostApplicationDisplayID" is first stored as the application name.
  void updateConfigurationWithContentsOfConfiguration(const std::optional<MessageDict>& configuration);

  void start();
  void stop();

  /// The one door through which a message enters, from a client or from a worker
  /// of this session. Normalises the record in place, keeps it unless it is
  /// redundant, and offers it to the consumers. `reply`, when given, is called
  /// once at the end.
  void sendMessage(const TalReportingSessionMessage::Pointer& message,
                   const std::function<void()>& reply = nullptr);

  /// True when the record repeats the last kept one of its category and type in
  /// all but its time stamps. Errors never do.
  bool messageIsRedundant(const TalReportingSessionMessage& message) const;

  // Normalisation of a record in place.
  static void addMissingDates(TalReportingSessionMessage& message, double now);
  static void removeWhiteSpaceFromKeys(TalReportingSessionMessage& message);
  static void addAudioMessageTag(TalReportingSessionMessage& message);
  void addAppName(TalReportingSessionMessage& message) const;

  static double getEpochTimeFromTalReportingStateMessage(const TalReportingSessionMessage& message) {
    return message.epochTime();
  }

  const WorkerRoster::Classes& getAllWorkerClasses() const { return roster_.getAllWorkerClasses(); }
  std::size_t workerInstanceCount() const { return message_workers_.size(); }

  /// "reporterID=…,serviceName=…,ownerPid=…,clientProcessName=…,
  /// HostApplicationDisplayID=…,started=…,singleMessageSession=…".
  std::string description() const;

  bool started() const { return started_; }
  bool isSingleMessageSession() const { return is_single_message_session_; }
  void setIsSingleMessageSession(bool single) { is_single_message_session_ = single; }
  AudioServiceType serviceType() const { return service_type_; }
  std::string_view serviceName() const { return service_name_; }
  const MessageDict& configuration() const { return configuration_; }
  ReporterID reporterID() const { return reporter_id_; }
  const std::vector<std::int32_t>& processIdentifiers() const { return process_identifiers_; }
  const ClientIdentity* clientIdentity() const { return client_identity_.get(); }
  const std::optional<std::string>& clientProcessName() const { return client_process_name_; }
  void setClientProcessName(std::optional<std::string> name) { client_process_name_ = std::move(name); }
  /// Every non-redundant message, and the start and stop state messages. In time
  /// order once a stop has begun.
  const std::vector<TalReportingSessionMessage::Pointer>& messages() const { return kept_.messages(); }
  /// Every value ever sent, the latest of each key.
  const MessageDict& previousValues() const { return previous_values_; }
  void addPreviousValues(const MessageDict& values) { previous_values_.merge(values); }
  /// Messages taken in since creation or the last stop.
  std::int64_t totalMessageCount() const { return total_message_count_; }
  const Platform& platform() const { return platform_; }
  /// What the owner's sessions hold in all, this one included.
  std::size_t ownerBytes() const { return owner_bytes_; }

  /// The client's pending start reply; empty when there is none.
  const StartReply& transactionCompleteBlock() const { return transaction_complete_block_; }
  void setTransactionCompleteBlock(StartReply reply) { transaction_complete_block_ = std::move(reply); }

 private:
  struct WorkerInstance {
    TalReportingSessionWorkerClass* worker_class;
    std::unique_ptr<TalReportingSessionWorker> worker;
    TalReportingSessionWorkerConsumer* consumer;  // the same worker, or null
    bool handles_redundant;
  };

  const LogChannel& log() const { return platform_.log.session; }
  void startWorkersFromClasses(const WorkerRoster::Classes& classes);
  void createWorker(TalReportingSessionWorkerClass& worker_class);
  void startWorker(WorkerInstance& instance);
  bool isInitialized(const TalReportingSessionWorkerClass& worker_class) const;
  std::vector<WorkerInstance*> workersGrouped(bool producers_first);
  void recordStateMessage(AudioEventType type);
  void deliver(const TalReportingSessionMessage::Pointer& message);
  void countPreviousValues();

  const Platform& platform_;
  const WorkerRoster& roster_;
  std::size_t& owner_bytes_;

  ReporterID reporter_id_;
  std::vector<std::int32_t> process_identifiers_;
  std::shared_ptr<const ClientIdentity> client_identity_;
  std::optional<std::string> client_process_name_;
  bool started_ = false;
  bool is_single_message_session_ = false;
  AudioServiceType service_type_ = AudioServiceType::kUnknown;
  std::string_view service_name_ = "unknown";
  MessageDict configuration_;
  StartReply transaction_complete_block_;
  KeptMessages kept_;
  MessageDict previous_values_;
  std::size_t previous_values_bytes_ = 0;  // as counted at the last stop
  std::int64_t total_message_count_ = 0;
  // In creation order. Last: workers end before what they refer to.
  std::vector<std::unique_ptr<WorkerInstance>> message_workers_;
  std::vector<WorkerInstance*> consuming_message_workers_;
  std::vector<WorkerInstance*> producing_message_workers_;
};

}  // namespace tal
