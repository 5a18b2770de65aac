#include "core/TalReportingSessionMessage.h"

#include <algorithm>

#include "core/MessageKeys.h"

namespace tal {

const TalReportingSessionMessage::WorkerClasses& TalReportingSessionMessage::destinationWorkers() const {
  static const WorkerClasses kAll;
  return destination_workers_ ? *destination_workers_ : kAll;
}

void TalReportingSessionMessage::setDestinationWorkers(WorkerClasses classes) {
  destination_workers_ = std::make_unique<const WorkerClasses>(std::move(classes));
}

std::string TalReportingSessionMessage::description() const {
  std::string text = "category=";
  text += TalReportingUtilityCategoryString(category_);
  text += " type=";
  text += TalReportingUtilityTypeString(type_);
  text += ' ';
  message_.appendText(text);
  return text;
}

TalReportingSessionMessage::Pointer TalReportingSessionMessage::copy(const LogChannel& log) const {
  TAL_LOG_DEBUG(log, "copyWithZone");
  Pointer record = initWithMessage(message_.deepCopy(), category_, type_);
  record->is_redundant_ = is_redundant_;
  record->is_session_started_ = is_session_started_;
  return record;
}

double TalReportingSessionMessage::epochTime() const {
  const MessageValue* stamp = message_.find(TalReportingMessageKeyTalTimestamp);
  return stamp ? stamp->toDouble() : 0.0;
}

namespace {

struct Stamped {
  double time;
  TalReportingSessionMessage::Pointer record;
};

// A stamp that is no number orders like an absent one: a comparison with NaN
// would break the sort.
double sortingTime(const TalReportingSessionMessage& record) {
  const double time = record.epochTime();
  return time == time ? time : 0.0;
}

}  // namespace

void TalReportingSessionMessage::sortMessages(std::vector<Pointer>& messages) {
  // The stamps are read once: a look-up in each comparison would dominate.
  std::vector<Stamped> stamped;
  stamped.reserve(messages.size());
  for (Pointer& record : messages) stamped.push_back({sortingTime(*record), std::move(record)});
  const auto earlier = [](const Stamped& a, const Stamped& b) { return a.time < b.time; };
  // Messages mostly arrive in order; then the list stays as it is in linear time.
  if (!std::is_sorted(stamped.begin(), stamped.end(), earlier)) {
    std::stable_sort(stamped.begin(), stamped.end(), earlier);
  }
  std::transform(stamped.begin(), stamped.end(), messages.begin(),
                 [](Stamped& entry) { return std::move(entry.record); });
}

}  // namespace tal
