#pragma once

// Which stored events a report is made of, told by their names.

#include <optional>
#include <string_view>

namespace tal::talctl {

/// What an event tells a report.
enum class ReportKind {
  kPlaying,      ///< A summary of one stretch of playing.
  kRecording,    ///< A summary of one stretch of recording.
  kStreamEnd,    ///< A stop, which may bear the figures of its whole stream.
  kTrouble,      ///< An error, an overload, an issue that was detected.
  kRowsGivenUp,  ///< The store itself has lost something.
};
constexpr std::size_t kReportKindCount = 5;

/// The parts of an event's name, which outlives them.
struct ReportedName {
  ReportKind kind;
  /// "" in the general name under which each message is stored beside the one of its service.
  std::string_view service;
  std::string_view event;  ///< Category and type: "IO.Error".
};

/// Nothing for an event that no report needs.
std::optional<ReportedName> parseReportedName(std::string_view name);

}  // namespace tal::talctl
