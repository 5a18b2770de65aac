#pragma once

// Hands a session's messages, and at its stop a summary of them, to the
// statistics of real-time communication.

#include <cstdint>
#include <memory>
#include <optional>

#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "workers/sinks/CallstatTraffic.h"

namespace tal {

/// The sub-category that the back-end knows: the low 16 bits.
std::uint16_t retrieveCallstatCategoryFromCategory(AudioEventCategory category);

/// True when the service's messages may wait for others to go with them.
bool shouldBatchCallstatEventsForServiceType(AudioServiceType type);

/// Copies and hands over; all traffic with the back-end is CallstatTraffic's, on a
/// queue of the worker's own. Destroyed without a stop it sends no summary, but
/// what it was given before still goes out.
///
/// `started` is the session's: true from the start on, whatever the back-end
/// says, so that what arrives before its answer waits for it.
class TalReportingSessionRtcWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// `session` and `own_class` outlive the worker.
  TalReportingSessionRtcWorker(TalReportingSession& session, const TalReportingSessionWorkerClass& own_class)
      : session_(session), own_class_(own_class) {}
  ~TalReportingSessionRtcWorker() override;

  std::optional<bool> start() override;
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  void stop() override;

  bool getCallstatStartedState() const { return traffic_ && traffic_->callstatSessionStarted(); }

 private:
  bool belongsInSummary(const TalReportingSessionMessage& message) const;

  TalReportingSession& session_;
  const TalReportingSessionWorkerClass& own_class_;
  std::shared_ptr<CallstatTraffic> traffic_;  // made on first use, with its queue
};

class TalReportingSessionRtcWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionRtcWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionRtcWorker",
                                       {.is_consumer = true, .handle_single_message_session = true}) {}

  /// None for test sessions.
  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;
};

}  // namespace tal
