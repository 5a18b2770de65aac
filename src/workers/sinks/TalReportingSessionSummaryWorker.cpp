#include "workers/sinks/TalReportingSessionSummaryWorker.h"

#include <utility>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

constexpr auto kSummaryCategory = static_cast<AudioEventCategory>(
    kAudioEventDomainSession | static_cast<std::uint32_t>(AudioEventCategory::kGeneric));
constexpr unsigned kBytesToMebibytesShift = 20;

std::string_view thermalStateWord(int state) {
  switch (state) {
    case 0:
      return "Nominal";
    case 1:
      return "Fair";
    case 2:
      return "Serious";
    case 3:
      return "Critical";
    default:
      return "Unknown";
  }
}

}  // namespace

bool TalReportingSessionSummaryWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  const MessageDict& dict = message->message();
  if (const MessageValue* duration = dict.find(TalReportingMessageKeySessionDuration)) {
    total_active_time_ += duration->toDouble();
    ++active_count_;
  } else if (const MessageValue* issue = dict.find(TalReportingMessageKeyIssueType);
             issue && issue->isString() && issue->string() == "overload") {
    // A message that closes an active period deliberately counts as nothing else.
    ++overload_count_;
  }
  return false;
}

void TalReportingSessionSummaryWorker::stop() {
  MessageDict summary = sessionFigures();
  addDeviceFigures(summary);
  session_.sendMessage(TalReportingSessionMessage::initWithMessage(std::move(summary), kSummaryCategory,
                                                                   AudioEventType::kSummary));
}

MessageDict TalReportingSessionSummaryWorker::sessionFigures() const {
  const double average = active_count_ == 0 ? 0.0 : total_active_time_ / active_count_;
  const std::uint64_t unique = session_.messages().size();
  // State messages are kept without being received, so the difference may wrap.
  const std::uint64_t redundant = static_cast<std::uint64_t>(session_.totalMessageCount()) - unique;
  MessageDict summary{
      {"total_active_time", total_active_time_},
      {"active_count", active_count_},
      {"overload_count", overload_count_},
      {"average_active_time", average},
      {"num_messages", session_.totalMessageCount()},
      {"num_unique_messages", unique},
      {"num_redundant_messages", redundant},
      {"singleMessageSession", session_.isSingleMessageSession()},
      {"summaryServiceName", session_.serviceName()},
      {TalReportingApplicationName, TalReportingUtilityRetrieveAppName(session_.configuration())}};
  if (const auto& name = session_.clientProcessName()) summary.set("clientProcessName", *name);
  return summary;
}

void TalReportingSessionSummaryWorker::addDeviceFigures(MessageDict& summary) const {
  const SystemState& device = session_.platform().system_state;
  summary.set("thermal_state", MessageValue::literal(thermalStateWord(device.thermalState())));
  summary.set("low_power_enabled", device.lowPowerModeIsOn() ? 1 : 0);
  const SystemState::Footprint footprint = device.physicalFootprint();
  if (footprint.bytes) {
    summary.set("vmInfo_phys_footprint_MiB", *footprint.bytes >> kBytesToMebibytesShift);
  } else {
    TAL_LOG_ERROR(session_.platform().log.summary, "Error with task_info(): ", footprint.error);
  }
  const auto [one, five, fifteen] = device.loadAverages();
  summary.set("load_avg_1_min", one);
  summary.set("load_avg_5_min", five);
  summary.set("load_avg_15_min", fifteen);
}

}  // namespace tal
