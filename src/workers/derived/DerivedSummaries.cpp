#include "workers/derived/DerivedSummaries.h"

#include <cstdint>

#include "core/MessageKeys.h"

namespace tal {

std::optional<double> timestampOf(const MessageDict& message) {
  const MessageValue* stamp = message.find(TalReportingMessageKeyTalTimestamp);
  return stamp ? std::optional(stamp->toDouble()) : std::nullopt;
}

std::string timestampText(const std::optional<double>& timestamp) {
  return timestamp ? MessageValue(*timestamp).text() : "(null)";
}

bool flagOf(const MessageDict& values, const MessageKey& key) {
  const MessageValue* value = values.find(key);
  return value && value->toBool();
}

void addMessageCount(DerivedMessages& summaries) {
  for (const auto& summary : summaries) {
    summary->mutableMessage().set(TalReportingMessageKeyMessageCount, std::uint64_t{summaries.size()});
  }
}

void sendDerived(TalReportingSession& session, const DerivedMessages& summaries) {
  for (const auto& summary : summaries) session.sendMessage(summary);
}

}  // namespace tal
