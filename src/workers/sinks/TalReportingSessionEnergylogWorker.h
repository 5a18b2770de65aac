#pragma once

// Forwards what clients report of the haptics engine's use to the power log, so
// that its energy can be attributed to applications.

#include <memory>
#include <string_view>

#include "core/MessageKey.h"
#include "platform/EnergylogSink.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// Keeps nothing between messages.
class TalReportingSessionEnergylogWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// The session outlives the worker.
  explicit TalReportingSessionEnergylogWorker(TalReportingSession& session) : session_(session) {}

  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;

  // Each sends its event when the message holds the value that the event is about.
  void handleEngineOnDurationMessage(const MessageDict& message);
  void handleEngineStateMessage(const MessageDict& message);
  void handleLongRunningMessage(const MessageDict& message);

 private:
  void send(std::string_view name, const MessageDict& payload);
  const LogChannel& log() const { return session_.platform().log.energylog; }

  TalReportingSession& session_;
};

class TalReportingSessionEnergylogWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionEnergylogWorkerClass()
      : TalReportingSessionWorkerClass(
            "TalReportingSessionEnergylogWorker",
            {.is_consumer = true, .start_on_init = true, .handle_single_message_session = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionEnergylogWorker>(session);
  }
};

}  // namespace tal
