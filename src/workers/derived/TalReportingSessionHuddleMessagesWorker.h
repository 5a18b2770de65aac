#pragma once

// Derives, at a session's stop, what happened in the group sessions (huddles) that
// the client told about: one summary for each.

#include <memory>

#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "workers/derived/DerivedSummaries.h"

namespace tal {

/// Reads the kept messages of category Huddle, but for summaries. Of these keys,
/// all optional, a client tells:
///
/// - "huddle_id": which group session; messages without it belong to one called
///   "unknown";
/// - "participant_count": how many take part at this moment;
/// - "active_speaker": who speaks at this moment, in any form that can be compared.
///
/// A message of type Activate says that a participant joined, Deactivate that one left.
///
/// A summary is a message of category Huddle, type Summary, with the keys
///
/// - "huddle_id": as told, else "unknown";
/// - "huddle_seconds", "huddle_secondsBucketed": seconds from its first message to
///   its last (32-bit float), and their bucket as text;
/// - "participants_max": largest "participant_count" seen, 0 when none was told;
/// - "joined_count", "left_count": participants that joined and left;
/// - "active_speaker_changes": how often "active_speaker" differed from the one
///   told before it;
/// - "HostApplicationDisplayID": the host application;
/// - "msgidx", "msgcnt": which of how many, from 1, in the order in which the
///   huddles began.
class TalReportingSessionHuddleMessagesWorker final : public TalReportingSessionWorker {
 public:
  /// `session` outlives the worker.
  explicit TalReportingSessionHuddleMessagesWorker(TalReportingSession& session) : session_(session) {}

  void stop() override;

  /// The summaries of the messages, which are in time order.
  static DerivedMessages createHuddleMessages(const DerivedMessages& messages, const MessageValue& process);

 private:
  TalReportingSession& session_;
};

class TalReportingSessionHuddleMessagesWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionHuddleMessagesWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionHuddleMessagesWorker", {.is_producer = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionHuddleMessagesWorker>(session);
  }
};

}  // namespace tal
