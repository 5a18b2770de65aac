#include "tools/talctl/report/ReportedName.h"

namespace tal::talctl {
namespace {

constexpr std::string_view kPrefix = "org.vantle.";
constexpr std::string_view kGeneralService = "talsys";
constexpr std::string_view kRowsGivenUp = "store.RowsGivenUp";

std::optional<ReportKind> kindOf(std::string_view category, std::string_view type) {
  if (type == "Summary") {
    if (category == "Volume") return ReportKind::kPlaying;
    if (category == "Input") return ReportKind::kRecording;
    return std::nullopt;
  }
  if (type == "Error" || type == "IssueDetector") return ReportKind::kTrouble;
  // "DSP_Error" is as much of an error.
  if (category == "Error" || category.ends_with("_Error")) return ReportKind::kTrouble;
  const bool streams = category == "Playback" || category == "Record" || category == "PlaybackAndRecord";
  if (type == "Stop" && streams) return ReportKind::kStreamEnd;
  return std::nullopt;
}

}  // namespace

std::optional<ReportedName> parseReportedName(std::string_view name) {
  if (!name.starts_with(kPrefix)) return std::nullopt;
  name.remove_prefix(kPrefix.size());
  const std::size_t dot = name.find('.');
  if (dot == std::string_view::npos) return std::nullopt;
  const std::string_view service = name.substr(0, dot);
  const std::string_view event = name.substr(dot + 1);
  const bool general = service == kGeneralService;
  if (general && event == kRowsGivenUp) return ReportedName{ReportKind::kRowsGivenUp, {}, event};

  const std::size_t middle = event.find('.');
  if (middle == std::string_view::npos) return std::nullopt;
  const auto kind = kindOf(event.substr(0, middle), event.substr(middle + 1));
  if (!kind) return std::nullopt;
  return ReportedName{*kind, general ? std::string_view() : service, event};
}

}  // namespace tal::talctl
