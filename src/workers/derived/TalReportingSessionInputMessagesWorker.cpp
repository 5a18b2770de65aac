#include "workers/derived/TalReportingSessionInputMessagesWorker.h"

#include <array>
#include <set>
#include <string>
#include <utility>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"
#include "workers/derived/TalReportingSessionWorkerUtility.h"

namespace tal {

namespace {

constexpr std::string_view kFunction =
    "-[TalReportingSessionInputMessagesWorker createInputMessages:process:minimumRunningtime:]";
constexpr double kMaximumPauseSeconds = 2.0;
constexpr std::array kKeysToCombine{TalReportingMessageKeySpatialAudioAccessoryFeature,
                                    TalReportingMessageKeySpatializationEnabled};
constexpr int kTimeFractionDigits = 0;

MessageDict defaultState() {
  const MessageValue unknown = MessageValue::literal("unknown");
  return {{TalReportingMessageKeySelectedFormat, unknown},
          {TalReportingMessageKeyActiveDevices, unknown},
          {TalReportingMessageKeyFormatID, unknown},
          {TalReportingMessageKeyVpConfigOperationMode, unknown},
          {TalReportingMessageKeyVpConfigInputPort, unknown},
          {TalReportingMessageKeyVpConfigPrimaryVocoderFs, unknown},
          {TalReportingMessageKeyVpConfigPrimaryVocoder, unknown}};
}

/// One walk over a session's messages.
class Derivation {
 public:
  // A running flag among the previous values stays, unlike for volumes: the first
  // message may see input running, and such a stretch, without a start, is
  // skipped. Deliberate.
  Derivation(const MessageDict& previous_values, const std::optional<MessageValue>& process,
             double minimum_running_seconds, const LogChannel& log)
      : state_(defaultState()), process_(process), minimum_(minimum_running_seconds), log_(log) {
    state_.merge(previous_values);
  }

  void take(const MessageDict& message) {
    const std::optional<double> time = timestampOf(message);
    const bool was_running = flagOf(state_, TalReportingMessageKeySessionInputRunning);
    const bool closes = message.contains(TalReportingMessageKeySessionDuration);
    const bool tells = message.contains(TalReportingMessageKeySessionInputRunning);
    bool changed = closes;
    if (tells && !flagOf(message, TalReportingMessageKeySessionInputRunning)) {
      running_ = false;
      changed = changed || was_running;
    } else if (tells || (running_ && !closes)) {
      running_ = true;
      if (tells && !was_running) start_time_ = time;
      changed = changed || TalReportingUtilityKeyIsPresentAndHasChanged(TalReportingMessageKeyActiveDevices,
                                                                        &message, &state_);
      recordCodec(message);
    } else {
      running_ = false;
    }
    if (was_running && changed) endStretch(time);
    if (!running_) start_time_.reset();
    state_.merge(message);
  }

  DerivedMessages finish() {
    addMessageCount(summaries_);
    TAL_LOG_DEBUG(log_, "returning input messages { func=", kFunction,
                  ", action=return, count=", summaries_.size(), " }");
    return std::move(summaries_);
  }

 private:
  // A change of codec alone never ends a stretch.
  void recordCodec(const MessageDict& message) {
    if (!TalReportingUtilityKeyIsPresentAndHasChanged(TalReportingMessageKeyVpConfigPrimaryVocoder, &message,
                                                      &state_)) {
      return;
    }
    const MessageValue* rate = message.find(TalReportingMessageKeyVpConfigPrimaryVocoderFs);
    const std::string rate_text = rate ? rate->text() : "(null)";
    if (rate_text.starts_with("0.")) return;
    codecs_.insert(message.find(TalReportingMessageKeyVpConfigPrimaryVocoder)->text() + ':' + rate_text);
  }

  void endStretch(const std::optional<double>& time) {
    const double seconds = time.value_or(0) - start_time_.value_or(0);
    TAL_LOG_DEBUG(log_, "runningTime { func=", kFunction, ", runningTime=", seconds,
                  ", talTimestamp=", timestampText(time), ", talTimestamp_double=", time.value_or(0),
                  ", startTalTimestamp=", timestampText(start_time_),
                  ", startTalTimestamp_double=", start_time_.value_or(0), " }");
    if (time && start_time_ && seconds > minimum_ && process_) {
      addSummary(seconds);
      TAL_LOG_DEBUG(log_, "added input message { func=", kFunction, ", action=add, count=", summaries_.size(),
                    " }");
    } else {
      TAL_LOG_DEBUG(log_, "skipped input message, too short { func=", kFunction,
                    ", action=skip, count=", summaries_.size(), " }");
    }
    start_time_ = time;
  }

  void addSummary(double seconds) {
    const auto state = [this](const MessageKey& key) { return std::pair(key, *state_.find(key)); };
    MessageDict summary{
        {TalReportingApplicationName, *process_},
        {TalReportingMessageKeyInputrunningSeconds, static_cast<float>(seconds)},
        {TalReportingMessageKeyInputrunningSecondsBucketed,
         *TalReportingUtilityBucketNumberToString(seconds, TalReportingUtilityBucketNumberToStringTimes,
                                                  kTimeFractionDigits)},
        {TalReportingMessageKeyMessageIndex, static_cast<std::int64_t>(summaries_.size() + 1)},
        state(TalReportingMessageKeyVpConfigOperationMode),
        state(TalReportingMessageKeyVpConfigInputPort),
        state(TalReportingMessageKeyActiveDevices)};
    if (!codecs_.empty()) summary.set(TalReportingMessageKeyVocoders, joinedCodecs());
    codecs_.clear();
    summaries_.push_back(TalReportingSessionMessage::initWithMessage(
        std::move(summary), AudioEventCategory::kInput, AudioEventType::kSummary));
  }

  std::string joinedCodecs() const {
    std::string joined;
    for (const std::string& codec : codecs_) {
      if (!joined.empty()) joined += ',';
      joined += codec;
    }
    return joined;
  }

  MessageDict state_;
  const std::optional<MessageValue>& process_;
  const double minimum_;
  const LogChannel& log_;
  std::optional<double> start_time_;
  bool running_ = false;
  std::set<std::string> codecs_;
  DerivedMessages summaries_;
};

}  // namespace

void TalReportingSessionInputMessagesWorker::stop() {
  if (session_.messages().empty()) return;
  // The least running time is deliberately the same as for volumes.
  const auto summaries =
      createInputMessages(session_.messages(), TalReportingUtilityRetrieveAppName(session_.configuration()),
                          TalReportingUtilityVolumeMinimumPlayingTime(session_.serviceType()));
  if (summaries.empty()) return;
  TAL_LOG(session_.platform().log.session, "sending input summary event for reporter ",
          session_.reporterID());
  sendDerived(session_, summaries);
}

DerivedMessages TalReportingSessionInputMessagesWorker::createInputMessages(
    const DerivedMessages& messages, const std::optional<MessageValue>& process,
    double minimum_running_seconds) const {
  const LogChannel& log = session_.platform().log.session;
  TAL_LOG_DEBUG(log, "entering createInputMessages ", kFunction);
  const auto combined =
      TalReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  Derivation derivation(session_.previousValues(), process, minimum_running_seconds, log);
  for (const auto& message : combined) derivation.take(message->message());
  return derivation.finish();
}

}  // namespace tal
