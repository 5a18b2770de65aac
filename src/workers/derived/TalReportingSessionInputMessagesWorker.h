#pragma once

// Derives, at a session's stop, how long input ran: one summary for every stretch
// with unchanged input devices, with the voice codecs that were in use.

#include <memory>
#include <optional>

#include "core/MessageValue.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "workers/derived/DerivedSummaries.h"

namespace tal {

/// A summary is a message of category Input, type Summary, with the keys
///
/// - "HostApplicationDisplayID": the host application;
/// - "inputrunning_seconds", "inputrunning_secondsBucketed": seconds (32-bit
///   float), and their bucket as text;
/// - "vp_config_operation_mode", "vp_config_input_port", "active_devices": as last
///   reported, "unknown" until then;
/// - "vocoders": "codec:rate" of each codec taken up, ascending, joined by ",";
///   absent without any;
/// - "msgidx", "msgcnt": which of how many, from 1.
class TalReportingSessionInputMessagesWorker final : public TalReportingSessionWorker {
 public:
  /// `session` outlives the worker.
  explicit TalReportingSessionInputMessagesWorker(TalReportingSession& session) : session_(session) {}

  void stop() override;

  /// The summaries of the messages, which are in time order; a stretch has to be
  /// longer than `minimum_running_seconds`. Bursts are combined in the records.
  DerivedMessages createInputMessages(const DerivedMessages& messages,
                                      const std::optional<MessageValue>& process,
                                      double minimum_running_seconds) const;

 private:
  TalReportingSession& session_;
};

class TalReportingSessionInputMessagesWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionInputMessagesWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionInputMessagesWorker", {.is_producer = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionInputMessagesWorker>(session);
  }
};

}  // namespace tal
