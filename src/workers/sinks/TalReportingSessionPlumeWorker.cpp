#include "workers/sinks/TalReportingSessionPlumeWorker.h"

#include <algorithm>
#include <array>
#include <string>

#include "core/MessageKeys.h"
#include "workers/sinks/AudioIssueDetected.h"

namespace tal {

namespace {

using plumemetrics::AudioIssueDetected;

struct TextField {
  MessageKey key;
  std::string AudioIssueDetected::*field;
};
constexpr std::array<TextField, 3> kTextFields{{
    {TalReportingMessageKeyIssueType, &AudioIssueDetected::issuetype},
    {TalReportingMessageKeyRtaidClient, &AudioIssueDetected::rtaidclient},
    {TalReportingMessageKeyNode, &AudioIssueDetected::node},
}};

// Readers of the record take its texts for NUL-terminated ones.
std::string terminatedText(const MessageValue& value) {
  std::string text = value.text();
  text.resize(std::min(text.find('\0'), text.size()));
  return text;
}

}  // namespace

bool TalReportingSessionPlumeWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (message->type() != AudioEventType::kIssueDetector) return false;
  AudioIssueDetected record;
  for (const TextField& text : kTextFields) {
    if (const auto* value = valueOrComplain(message->message(), text.key)) {
      record.*text.field = terminatedText(*value);
    }
  }
  if (const auto* value =
          valueOrComplain(message->message(), TalReportingMessageKeyAnyChannelSilenceSeconds)) {
    record.duration = static_cast<std::int32_t>(value->toInt64());
  }
  // Incomplete ones as well: a partial record is still worth counting.
  session_.platform().plume_metrics.postMetric(AudioIssueDetected::kMetric, record);
  return false;
}

const MessageValue* TalReportingSessionPlumeWorker::valueOrComplain(const MessageDict& message,
                                                                    const MessageKey& key) const {
  const MessageValue* value = message.find(key);
  if (!value) {
    TAL_LOG_ERROR(session_.platform().log.plume, "Failed to get ", key.text, " for AudioIssueDetected");
  }
  return value;
}

}  // namespace tal
