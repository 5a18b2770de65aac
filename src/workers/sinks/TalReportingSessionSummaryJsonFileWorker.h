#pragma once

// Writes what a session kept into one JSON file at its stop, for engineers to
// read on the device: on internal builds, and for test sessions everywhere.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>

#include "platform/DiagnosticLog.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// Where the files go, below the diagnostic-log directory.
inline constexpr std::string_view TalReportingLogsDirectory = "Audio/Reporting";

/// The file holds a JSON array, one entry for each non-redundant message:
/// {"<category>_<type>_<n>": {…}}, where n counts the messages of the kind from
/// 1. Entries are written one by one, so memory stays flat.
class TalReportingSessionSummaryJsonFileWorker final : public TalReportingSessionWorker {
 public:
  /// `session` outlives the worker.
  explicit TalReportingSessionSummaryJsonFileWorker(TalReportingSession& session) : session_(session) {
    setStarted(true);
  }

  void stop() override;

 private:
  const LogChannel& log() const { return session_.platform().log.session; }
  void writeMessage(TalReportingSessionMessage& message);
  void openFile();
  void writeLine(std::string_view line);
  void closeFile();
  /// False when the dictionary holds what JSON cannot.
  bool formatEntry(std::string_view name, const MessageDict& message);

  TalReportingSession& session_;
  std::string report_path_;  // empty while no file was opened
  std::unique_ptr<DiagnosticFile> report_file_;
  std::unordered_map<std::string, std::uint64_t> counts_;
  std::string entry_;  // kept for its memory
};

class TalReportingSessionSummaryJsonFileWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionSummaryJsonFileWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionSummaryJsonFileWorker", {}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;
};

}  // namespace tal
