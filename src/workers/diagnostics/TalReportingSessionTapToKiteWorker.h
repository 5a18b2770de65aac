#pragma once

// Asks the user of an internal build to file a bug report when a video call gives
// the audio layer coordinates that no sound can be placed at.

#include <memory>
#include <string_view>

#include "platform/TapToKiteService.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// Armed by the first message of its session, watches from five seconds after it:
/// a call that begins may well have no coordinates yet. Prompts once between two
/// stops of its session, and once in the back-off time on the whole device.
class TalReportingSessionTapToKiteWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// `session` outlives the worker.
  TalReportingSessionTapToKiteWorker(TalReportingSession& session, double back_off_seconds)
      : session_(session), back_off_time_(back_off_seconds) {}

  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  void stop() override;

  /// True for a message that calls for a prompt, which then counts as made.
  bool interestedInMessage(const TalReportingSessionMessage& message);

  /// True when the time under the key is less than `timeframe` seconds ago.
  /// Otherwise the present time is stored there: whoever is told "no" has used up
  /// the back-off time, deliberately even when no prompt follows.
  bool hasRunInTimeframe(double timeframe, std::string_view key);

 private:
  const LogChannel& log() const { return session_.platform().log.session; }
  static KiteDraft kiteDraftForParleyXYerror();

  TalReportingSession& session_;
  const double back_off_time_;        // seconds
  double minimum_message_time_ = -1;  // seconds since 1970; not above 0 until armed
  bool has_run_ = false;
};

class TalReportingSessionTapToKiteWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionTapToKiteWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionTapToKiteWorker",
                                       {.is_consumer = true, .handle_single_message_session = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;
};

}  // namespace tal
