#include "workers/sinks/TalReportingSessionSummaryJsonFileWorker.h"

#include "core/MessageJson.h"
#include "core/MessageKeys.h"
#include "core/SafeFileName.h"
#include "core/TalReportingUtility.h"

namespace tal {

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionSummaryJsonFileWorkerClass::initWithSession(
    TalReportingSession& session) {
  if (session.serviceType() != AudioServiceType::kTest && !session.platform().internal_build) return nullptr;
  return std::make_unique<TalReportingSessionSummaryJsonFileWorker>(session);
}

void TalReportingSessionSummaryJsonFileWorker::stop() {
  if (session_.messages().empty()) return;
  counts_.clear();
  for (const auto& message : session_.messages()) {
    if (!message->isRedundant()) writeMessage(*message);
  }
  closeFile();
  report_path_.clear();
  counts_.clear();
}

void TalReportingSessionSummaryJsonFileWorker::writeMessage(TalReportingSessionMessage& message) {
  if (report_path_.empty()) {
    openFile();
  } else {
    writeLine(",");
  }
  std::string name = TalReportingUtilityCategoryString(message.category());
  name += '_';
  name += TalReportingUtilityTypeString(message.type());
  const std::uint64_t number = ++counts_[name];
  name += '_' + std::to_string(number);
  message.mutableMessage().set("isSessionStarted",
                               MessageValue::literal(message.isSessionStarted() ? "YES" : "NO"));
  if (formatEntry(name, message.message())) {
    writeLine(entry_);
  } else {
    // The "," before it stays: the reader of a broken file is to see that it is.
    TAL_LOG_ERROR(log(), "dataWithJSONObject: ", name, " holds a number that JSON cannot express");
  }
}

bool TalReportingSessionSummaryJsonFileWorker::formatEntry(std::string_view name,
                                                           const MessageDict& message) {
  entry_ = "{\n  \"";
  entry_ += name;
  entry_ += "\": {";
  bool first = true;
  for (const auto& [key, value] : message) {
    entry_ += first ? "\n    " : ",\n    ";
    first = false;
    appendJson(entry_, MessageValue::literal(key));
    entry_ += ": ";
    if (!appendJson(entry_, value, JsonNonFinite::kFail)) return false;
  }
  entry_ += "\n  }\n}";
  return true;
}

void TalReportingSessionSummaryJsonFileWorker::openFile() {
  const Platform& platform = session_.platform();
  const std::string directory = platform.diagnostic_log.pathOf(TalReportingLogsDirectory);
  if (const auto error = platform.diagnostic_log.makeDirectory(TalReportingLogsDirectory)) {
    TAL_LOG_ERROR(log(), "can't create logging directory at ", directory, ": ", *error);
  }
  std::string name = platform.clock.localTimeForFileName();
  name += '-' + std::to_string(session_.reporterID());
  name += '-' + safeInFileName(TalReportingUtilityRetrieveAppName(session_.configuration()).text());
  name += '-';
  name += session_.serviceName();
  name += ".json";
  report_path_ = directory + '/' + name;

  auto opened = platform.diagnostic_log.createFile(TalReportingLogsDirectory, name);
  setStarted(opened.file != nullptr);
  if (!opened.file) {
    TAL_LOG_ERROR(log(), "SummaryJsonFileWorker failed to open file. action=open file=", report_path_,
                  " error=\"", opened.error, "\"");
    return;
  }
  report_file_ = std::move(opened.file);
  TAL_LOG_INFO(log(), "SummaryJsonFileWorker opened file. action=open file=", report_path_);
  writeLine("[");
}

void TalReportingSessionSummaryJsonFileWorker::writeLine(std::string_view line) {
  if (!report_file_) return;
  auto error = report_file_->write(line);
  if (!error) error = report_file_->write("\n");
  if (error) {
    TAL_LOG_ERROR(log(), "SummaryJsonFileWorker failed to write line. action=writeline file=", report_path_,
                  " error=\"", *error, "\"");
  }
}

void TalReportingSessionSummaryJsonFileWorker::closeFile() {
  writeLine("]");
  const auto error = report_file_ ? report_file_->close() : std::nullopt;
  report_file_.reset();
  if (error) {
    // "failed to closed" is what log readers match.
    TAL_LOG_ERROR(log(), "SummaryJsonFileWorker failed to closed file. action=close file=", report_path_,
                  " error=\"", *error, "\"");
  } else {
    TAL_LOG_INFO(log(), "SummaryJsonFileWorker closed file. action=close file=", report_path_);
  }
}

}  // namespace tal
