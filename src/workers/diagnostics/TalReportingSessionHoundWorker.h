#pragma once

// Watches a session's messages for known faults and, when one has been seen often
// enough, has the device's state captured for engineers. Internal builds only.

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "workers/diagnostics/HoundInstanceRegistry.h"
#include "workers/diagnostics/TalReportingHoundWorkerInstance.h"

namespace tal {

/// What stands for the identifier of a capture that did not come about.
inline constexpr std::string_view kNoHoundSessionReturned = "NONE_RETURNED";

/// Counts, for each instance, the messages that it is interested in, and fires it
/// at its threshold.
class TalReportingSessionHoundWorker final : public TalReportingSessionWorkerConsumer {
 public:
  using InstanceClasses = std::vector<TalReportingHoundWorkerInstanceClass>;

  /// All outlive the worker.
  TalReportingSessionHoundWorker(TalReportingSession& session, SymptomReporterFactory& reporters,
                                 const InstanceClasses& instance_classes, HoundInstanceRegistry& registry);

  std::optional<bool> start() override;
  void stop() override;
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  bool handleRedundantMessages() const override { return true; }

  static SymptomReporterService::Signature signatureFromMessage(const TalReportingSessionMessage& message,
                                                                AudioServiceType audio_service_type,
                                                                SymptomReporterService& symptom_reporter,
                                                                std::string_view client_process_name);

  /// The capture's identifier in a reply, else `kNoHoundSessionReturned`; logs which.
  static std::string getSessionIdentifierFromResponse(const std::optional<MessageDict>& response,
                                                      const LogChannel& log);

 private:
  struct Instance {
    std::string_view class_name;
    std::unique_ptr<TalReportingHoundWorkerInstance> instance;
  };

  void addInstance(const TalReportingHoundWorkerInstanceClass& instance_class,
                   HoundInstanceRegistry& registry);
  void offer(const Instance& instance, const TalReportingSessionMessage& message);
  bool thresholdIsReached(const WorkerInstanceState& state) const;
  void fire(TalReportingHoundWorkerInstance& instance, const TalReportingSessionMessage& message);
  SymptomContext context() const;
  const LogChannel& log() const { return session_.platform().log.hound; }

  TalReportingSession& session_;
  SymptomReporterFactory& reporters_;
  std::vector<Instance> instances_;
};

class TalReportingSessionHoundWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  using InstanceClasses = TalReportingSessionHoundWorker::InstanceClasses;

  TalReportingSessionHoundWorkerClass();
  explicit TalReportingSessionHoundWorkerClass(InstanceClasses instance_classes);

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;

 private:
  const InstanceClasses instance_classes_;
  HoundInstanceRegistry registry_;
};

}  // namespace tal
