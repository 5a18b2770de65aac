#pragma once

// Derives, at a session's stop, how long output ran at which volume: one summary
// for every stretch with one unchanged set of volume-related settings.

#include <memory>
#include <optional>

#include "core/MessageValue.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "workers/derived/DerivedSummaries.h"

namespace tal {

/// A summary is a message of category Volume, type Summary, with the keys
///
/// - "session_selected_format", "mFormatID", "active_devices": as last reported,
///   "unknown" until then;
/// - "HostApplicationDisplayID": the host application;
/// - "RvSessionVolume", "RvSessionVolumeBucketed": gain, and its bucket as text;
/// - "play_seconds", "play_secondsBucketed": seconds played (32-bit float), and
///   their bucket as text;
/// - "spatial-audio-accessory-feature", "spatializationEnabled", "ringerstate": as
///   last reported, else false;
/// - "mChannelsPerFrame": as last reported, else -1;
/// - "msgidx", "msgcnt": which of how many, from 1.
class TalReportingSessionVolumeMessagesWorker final : public TalReportingSessionWorker {
 public:
  /// `session` outlives the worker.
  explicit TalReportingSessionVolumeMessagesWorker(TalReportingSession& session) : session_(session) {}

  void stop() override;

  /// The summaries of the messages, which are in time order; a stretch has to be
  /// longer than `minimum_play_seconds`. Bursts are combined in the records.
  DerivedMessages createVolumeMessages(const DerivedMessages& messages,
                                       const std::optional<MessageValue>& process,
                                       double minimum_play_seconds) const;

 private:
  TalReportingSession& session_;
};

class TalReportingSessionVolumeMessagesWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionVolumeMessagesWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionVolumeMessagesWorker", {.is_producer = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionVolumeMessagesWorker>(session);
  }
};

}  // namespace tal
