#pragma once

// Counts audio issues: each issue message becomes one record for wireless
// diagnostics.

#include <memory>

#include "platform/PlumeMetricSubmitter.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// Keeps nothing between messages.
class TalReportingSessionPlumeWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// The session outlives the worker.
  explicit TalReportingSessionPlumeWorker(TalReportingSession& session) : session_(session) {}

  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;

 private:
  const MessageValue* valueOrComplain(const MessageDict& message, const MessageKey& key) const;

  TalReportingSession& session_;
};

class TalReportingSessionPlumeWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionPlumeWorkerClass()
      : TalReportingSessionWorkerClass(
            "TalReportingSessionPlumeWorker",
            {.is_consumer = true, .start_on_init = true, .handle_single_message_session = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionPlumeWorker>(session);
  }
};

}  // namespace tal
