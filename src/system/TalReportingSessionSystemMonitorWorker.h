#pragma once

// Brings the state of the system into a session: what it is when the session
// starts, and every change while it runs.

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "system/SystemMonitorDictionary.h"
#include "system/TalReportingSystemMonitor.h"

namespace tal {

/// Sends each feature state as a message of category Setup, type Setup: the
/// feature's value under its name, and "last_updated", the time at which it was
/// read (seconds since 1970). The message's own time stamp is that of its arrival.
class TalReportingSessionSystemMonitorWorker final : public TalReportingSessionWorker {
 public:
  /// `session` outlives the worker. Without a dictionary there is nothing to send.
  TalReportingSessionSystemMonitorWorker(TalReportingSession& session,
                                         std::shared_ptr<SystemMonitorDictionary> dictionary,
                                         std::vector<std::string> feature_keys);
  ~TalReportingSessionSystemMonitorWorker() override;

  std::optional<bool> start() override;
  void stop() override;

  /// Sends one state. An empty or missing one sends nothing.
  void handleChange(const std::optional<MessageDict>& feature_state);

 private:
  TalReportingSession& session_;
  const std::shared_ptr<SystemMonitorDictionary> dictionary_;
  const std::vector<std::string> feature_keys_;
  std::vector<SystemMonitorDictionary::Observation> observations_;
};

class TalReportingSessionSystemMonitorWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `monitor` outlives the class.
  explicit TalReportingSessionSystemMonitorWorkerClass(const TalReportingSystemMonitor& monitor)
      : TalReportingSessionWorkerClass("TalReportingSessionSystemMonitorWorker", {.is_producer = true}),
        monitor_(monitor) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionSystemMonitorWorker>(
        session, monitor_.getSystemMonitorDictionary(), monitor_.getSystemMonitorKeys());
  }

 private:
  const TalReportingSystemMonitor& monitor_;
};

}  // namespace tal
