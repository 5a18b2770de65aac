#include "system/TalReportingSessionSystemMonitorWorker.h"

#include <utility>

#include "core/MessageKeys.h"

namespace tal {

namespace {
constexpr MessageKey kLastUpdated{"last_updated"};
}  // namespace

TalReportingSessionSystemMonitorWorker::TalReportingSessionSystemMonitorWorker(
    TalReportingSession& session, std::shared_ptr<SystemMonitorDictionary> dictionary,
    std::vector<std::string> feature_keys)
    : session_(session), dictionary_(std::move(dictionary)), feature_keys_(std::move(feature_keys)) {}

// A session can be released without having been stopped.
TalReportingSessionSystemMonitorWorker::~TalReportingSessionSystemMonitorWorker() {
  TalReportingSessionSystemMonitorWorker::stop();
}

std::optional<bool> TalReportingSessionSystemMonitorWorker::start() {
  if (!dictionary_) return true;
  observations_.reserve(feature_keys_.size());
  for (const std::string& feature : feature_keys_) {
    handleChange(dictionary_->stateOf(feature));
    observations_.push_back(
        dictionary_->observe(feature, [this](const MessageDict& state) { handleChange(state); }));
  }
  return true;
}

void TalReportingSessionSystemMonitorWorker::stop() {
  if (!dictionary_) return;
  const auto held = dictionary_->lock();
  observations_.clear();
}

void TalReportingSessionSystemMonitorWorker::handleChange(const std::optional<MessageDict>& feature_state) {
  if (!feature_state) return;
  MessageDict message = *feature_state;
  // The session stamps the message with its own time of arrival.
  if (const MessageValue* read_at = message.find(TalReportingMessageKeyTalTimestamp)) {
    message.set(kLastUpdated, MessageValue(*read_at));
    message.erase(TalReportingMessageKeyTalTimestamp);
    message.erase(TalReportingInternalEventSystemUptimeSec);
  }
  if (message.empty()) return;
  session_.sendMessage(TalReportingSessionMessage::initWithMessage(
      std::move(message), AudioEventCategory::kSetup, AudioEventType::kSetup));
}

}  // namespace tal
