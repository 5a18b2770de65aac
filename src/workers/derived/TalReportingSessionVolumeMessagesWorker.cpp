#include "workers/derived/TalReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <utility>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"
#include "workers/derived/TalReportingSessionWorkerUtility.h"

namespace tal {

namespace {

constexpr std::string_view kFunction =
    "-[TalReportingSessionVolumeMessagesWorker createVolumeMessages:process:minimumPlaytime:]";
constexpr double kMaximumPauseSeconds = 5.0;
constexpr std::array kKeysToCombine{TalReportingMessageKeySpatialAudioAccessoryFeature,
                                    TalReportingMessageKeySpatializationEnabled};
constexpr int kVolumeFractionDigits = 4;
constexpr int kTimeFractionDigits = 0;

MessageDict defaultState() {
  return {{TalReportingMessageKeySelectedFormat, MessageValue::literal("unknown")},
          {TalReportingMessageKeyActiveDevices, MessageValue::literal("unknown")},
          {TalReportingMessageKeyFormatID, MessageValue::literal("unknown")},
          {TalReportingMessageKeySpatialAudioAccessoryFeature, false},
          {TalReportingMessageKeySpatializationEnabled, false},
          {TalReportingMessageKeyRingerState, false},
          {TalReportingMessageKeyChannelsPerFrame, -1}};
}

bool stringsDiffer(const MessageDict& message, const MessageDict& state, const MessageKey& key) {
  const MessageValue* now = message.find(key);
  const MessageValue* before = state.find(key);
  return now && before && now->isString() && before->isString() && now->string() != before->string();
}

bool numbersDiffer(const MessageDict& message, const MessageDict& state, const MessageKey& key) {
  const MessageValue* now = message.find(key);
  const MessageValue* before = state.find(key);
  return now && before && now->toDouble() != before->toDouble();
}

/// One walk over a session's messages.
class Derivation {
 public:
  Derivation(const MessageDict& previous_values, const std::optional<MessageValue>& process,
             double minimum_play_seconds, const LogChannel& log)
      : state_(defaultState()), process_(process), minimum_(minimum_play_seconds), log_(log) {
    state_.merge(previous_values);
    if (!flagOf(state_, TalReportingMessageKeySessionOutputRunning)) return;
    // A stretch from before is never reported on its own, deliberately: with the
    // key gone it can only end after a later message has brought it again.
    start_time_ = timestampOf(state_);
    running_ = true;
    state_.erase(TalReportingMessageKeySessionOutputRunning);
  }

  void take(const MessageDict& message) {
    const std::optional<double> time = timestampOf(message);
    const bool was_running = flagOf(state_, TalReportingMessageKeySessionOutputRunning);
    const bool closes = message.contains(TalReportingMessageKeySessionDuration);
    bool changed = closes;
    if (message.contains(TalReportingMessageKeySessionOutputRunning)) {
      running_ = flagOf(message, TalReportingMessageKeySessionOutputRunning);
      if (running_ && !was_running) start_time_ = time;
      if (!running_) changed = closes || was_running;
    } else {
      running_ = running_ && !closes;
    }
    changed = changed || (running_ && settingsDiffer(message));
    if (was_running && changed) endStretch(time);
    if (!running_) start_time_.reset();
    state_.merge(message);
  }

  DerivedMessages finish() {
    addMessageCount(summaries_);
    return std::move(summaries_);
  }

 private:
  // Format identifier, channels and the accessory feature are reported, but never
  // end a stretch.
  bool settingsDiffer(const MessageDict& message) const {
    return stringsDiffer(message, state_, TalReportingMessageKeySelectedFormat) ||
           stringsDiffer(message, state_, TalReportingMessageKeyActiveDevices) ||
           numbersDiffer(message, state_, TalReportingMessageKeySpatializationEnabled) ||
           numbersDiffer(message, state_, TalReportingMessageKeyRingerState) ||
           numbersDiffer(message, state_, TalReportingMessageKeyVolume);
  }

  void endStretch(const std::optional<double>& time) {
    const double seconds = time.value_or(0) - start_time_.value_or(0);
    TAL_LOG_DEBUG(log_, "playingTime { func=", kFunction, ", playingTime=", seconds,
                  ", talTimestamp=", timestampText(time), ", talTimestamp_double=", time.value_or(0),
                  ", startTalTimestamp=", timestampText(start_time_),
                  ", startTalTimestamp_double=", start_time_.value_or(0), " }");
    const MessageValue* volume = state_.find(TalReportingMessageKeyVolume);
    if (time && start_time_ && seconds > minimum_ && volume && process_) {
      addSummary(seconds, *volume);
      TAL_LOG_DEBUG(log_, "added volume message { func=", kFunction,
                    ", action=add, count=", summaries_.size(), " }");
    } else {
      TAL_LOG_DEBUG(log_, "skipped volume message, too short { func=", kFunction,
                    ", action=skip, count=", summaries_.size(), " }");
    }
    start_time_ = time;
  }

  void addSummary(double seconds, const MessageValue& volume) {
    const auto state = [this](const MessageKey& key) { return std::pair(key, *state_.find(key)); };
    MessageDict summary{
        state(TalReportingMessageKeySelectedFormat),
        state(TalReportingMessageKeyFormatID),
        state(TalReportingMessageKeyActiveDevices),
        {TalReportingApplicationName, *process_},
        {TalReportingMessageKeyVolume, volume},
        {TalReportingMessageKeyVolumeBucketed,
         *TalReportingUtilityBucketNumberToString(
             volume.toDouble(), TalReportingUtilityBucketNumberToStringVolumes, kVolumeFractionDigits)},
        {TalReportingMessageKeyPlayseconds, static_cast<float>(seconds)},
        state(TalReportingMessageKeySpatialAudioAccessoryFeature),
        state(TalReportingMessageKeySpatializationEnabled),
        state(TalReportingMessageKeyRingerState),
        state(TalReportingMessageKeyChannelsPerFrame),
        {TalReportingMessageKeyPlaysecondsBucketed,
         *TalReportingUtilityBucketNumberToString(seconds, TalReportingUtilityBucketNumberToStringTimes,
                                                  kTimeFractionDigits)},
        {TalReportingMessageKeyMessageIndex, static_cast<std::int64_t>(summaries_.size() + 1)}};
    summaries_.push_back(TalReportingSessionMessage::initWithMessage(
        std::move(summary), AudioEventCategory::kVolume, AudioEventType::kSummary));
  }

  MessageDict state_;
  const std::optional<MessageValue>& process_;
  const double minimum_;
  const LogChannel& log_;
  std::optional<double> start_time_;
  bool running_ = false;
  DerivedMessages summaries_;
};

}  // namespace

void TalReportingSessionVolumeMessagesWorker::stop() {
  if (session_.messages().empty()) return;
  const auto summaries =
      createVolumeMessages(session_.messages(), TalReportingUtilityRetrieveAppName(session_.configuration()),
                           TalReportingUtilityVolumeMinimumPlayingTime(session_.serviceType()));
  if (summaries.empty()) return;
  TAL_LOG(session_.platform().log.session, "sending volume event for reporter ", session_.reporterID());
  sendDerived(session_, summaries);
}

DerivedMessages TalReportingSessionVolumeMessagesWorker::createVolumeMessages(
    const DerivedMessages& messages, const std::optional<MessageValue>& process,
    double minimum_play_seconds) const {
  const LogChannel& log = session_.platform().log.session;
  TAL_LOG_DEBUG(log, "entering createVolumeMessages ", kFunction);
  const auto combined =
      TalReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  Derivation derivation(session_.previousValues(), process, minimum_play_seconds, log);
  for (const auto& message : combined) derivation.take(message->message());
  return derivation.finish();
}

}  // namespace tal
