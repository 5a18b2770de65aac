#pragma once

// What the bug-capture worker asks of each kind of fault that it watches for.

#include <functional>
#include <memory>
#include <string_view>
#include <utility>

#include "core/TalReportingSessionMessage.h"
#include "session/TalReportingSession.h"
#include "workers/diagnostics/HoundInstanceRegistry.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tal {

/// Knows one fault: which messages are evidence of it, and what to capture. The
/// worker counts. Lives on the reporting queue.
class TalReportingHoundWorkerInstance {
 public:
  /// `session` outlives the instance.
  TalReportingHoundWorkerInstance(TalReportingSession& session, std::shared_ptr<WorkerInstanceState> state)
      : session_(session), worker_state_(std::move(state)) {}
  TalReportingHoundWorkerInstance(const TalReportingHoundWorkerInstance&) = delete;
  TalReportingHoundWorkerInstance& operator=(const TalReportingHoundWorkerInstance&) = delete;
  virtual ~TalReportingHoundWorkerInstance() = default;

  virtual bool interestedInMessage(const TalReportingSessionMessage& message) const = 0;

  // What follows is optional.
  virtual void handleMessage(const TalReportingSessionMessage& /*interesting*/) {}
  /// False where there is no `fire`: messages are then counted and no more.
  virtual bool implementsFire() const { return true; }
  /// Asks the state's reporter for the capture.
  virtual void fire(const TalReportingSessionMessage& /*message*/) {}
  virtual void start() {}
  virtual void stop() {}

  WorkerInstanceState& workerState() const { return *worker_state_; }

 protected:
  TalReportingSession& session() const { return session_; }
  const LogChannel& log() const { return session_.platform().log.hound; }
  /// For replies, which may come when the session and this are gone.
  const std::shared_ptr<WorkerInstanceState>& sharedState() const { return worker_state_; }

 private:
  TalReportingSession& session_;
  const std::shared_ptr<WorkerInstanceState> worker_state_;
};

/// One row of the roster of instances.
struct TalReportingHoundWorkerInstanceClass {
  std::string_view name;
  bool handleSingleMessageSession = false;
  /// The device property that must be true for it to be added; empty: none.
  std::string_view device_property = {};
  /// May answer null: the instance then takes no part in the session.
  std::function<std::unique_ptr<TalReportingHoundWorkerInstance>(TalReportingSession&,
                                                                 HoundInstanceRegistry&)>
      initWithSession = {};
};

}  // namespace tal
