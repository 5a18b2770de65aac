#include "workers/derived/TalReportingSessionHuddleMessagesWorker.h"

#include <algorithm>
#include <cstdint>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

constexpr MessageKey kHuddleID{"huddle_id"};
constexpr MessageKey kParticipantCount{"participant_count"};
constexpr MessageKey kActiveSpeaker{"active_speaker"};
constexpr int kTimeFractionDigits = 0;

/// What is known of one huddle so far.
struct Huddle {
  MessageValue id;
  double first_time;
  double last_time;
  std::int64_t participants_max = 0;
  std::uint64_t joined = 0;
  std::uint64_t left = 0;
  std::uint64_t speaker_changes = 0;
  std::optional<MessageValue> speaker = {};

  void take(const TalReportingSessionMessage& record) {
    last_time = record.epochTime();
    if (record.type() == AudioEventType::kActivate) ++joined;
    if (record.type() == AudioEventType::kDeactivate) ++left;
    if (const MessageValue* count = record.message().find(kParticipantCount)) {
      participants_max = std::max(participants_max, count->toInt64());
    }
    if (const MessageValue* now = record.message().find(kActiveSpeaker)) {
      if (speaker && !(*speaker == *now)) ++speaker_changes;
      speaker = *now;
    }
  }

  MessageDict summary(std::size_t index, const MessageValue& process) const {
    const double seconds = last_time - first_time;
    return {{kHuddleID, id},
            {"huddle_seconds", static_cast<float>(seconds)},
            {"huddle_secondsBucketed",
             *TalReportingUtilityBucketNumberToString(seconds, TalReportingUtilityBucketNumberToStringTimes,
                                                      kTimeFractionDigits)},
            {"participants_max", participants_max},
            {"joined_count", joined},
            {"left_count", left},
            {"active_speaker_changes", speaker_changes},
            {TalReportingApplicationName, process},
            {TalReportingMessageKeyMessageIndex, static_cast<std::int64_t>(index)}};
  }
};

}  // namespace

void TalReportingSessionHuddleMessagesWorker::stop() {
  const auto summaries =
      createHuddleMessages(session_.messages(), TalReportingUtilityRetrieveAppName(session_.configuration()));
  if (summaries.empty()) return;
  TAL_LOG(session_.platform().log.session, "sending huddle event for reporter ", session_.reporterID());
  sendDerived(session_, summaries);
}

DerivedMessages TalReportingSessionHuddleMessagesWorker::createHuddleMessages(const DerivedMessages& messages,
                                                                              const MessageValue& process) {
  std::vector<Huddle> huddles;
  std::unordered_map<std::string, std::size_t> positions;
  for (const auto& message : messages) {
    if (message->category() != AudioEventCategory::kHuddle || message->type() == AudioEventType::kSummary)
      continue;
    const MessageValue* told = message->message().find(kHuddleID);
    const MessageValue id = told ? *told : MessageValue::literal("unknown");
    const auto [position, is_new] = positions.emplace(id.text(), huddles.size());
    if (is_new)
      huddles.push_back({.id = id, .first_time = message->epochTime(), .last_time = message->epochTime()});
    huddles[position->second].take(*message);
  }
  DerivedMessages summaries;
  for (const Huddle& huddle : huddles) {
    summaries.push_back(
        TalReportingSessionMessage::initWithMessage(huddle.summary(summaries.size() + 1, process),
                                                    AudioEventCategory::kHuddle, AudioEventType::kSummary));
  }
  addMessageCount(summaries);
  return summaries;
}

}  // namespace tal
