#include "platform/linux/capture/CaptureWriter.h"

#include <utility>

#include "core/MessageJson.h"
#include "platform/linux/capture/CaptureSettings.h"
#include "platform/linux/capture/ProcFile.h"
#include "platform/linux/capture/ProcessReport.h"
#include "platform/linux/capture/SystemReport.h"
#include "platform/linux/settings/AtomicFile.h"

namespace tal {

namespace {

// What the bounds of its parts add up to: so much room is made before one is written.
constexpr std::uint64_t kMostCaptureBytes = std::uint64_t{48} << 20;
constexpr std::size_t kMostMessagesBytes = std::size_t{4} << 20;

std::string jsonLine(const MessageDict& dict) {
  std::string text;
  appendJson(text, dict);
  text += '\n';
  return text;
}

// One message a line; of more than the file may hold, the last ones.
std::string messagesFile(const SymptomContext& context) {
  std::vector<std::string> lines;  // the newest first
  std::size_t bytes = 0;
  const auto& messages = context.last_messages;
  // Not every compiler can read the library's reversed ranges. NOLINTNEXTLINE(modernize-loop-convert)
  for (auto each = messages.rbegin(); each != messages.rend(); ++each) {
    lines.push_back(jsonLine({{"category", TalReportingUtilityCategoryString(each->category)},
                              {"type", TalReportingUtilityTypeString(each->type)},
                              {"message", each->message}}));
    bytes += lines.back().size();
    if (bytes > kMostMessagesBytes) {
      lines.pop_back();
      break;
    }
  }
  std::string text;
  // NOLINTNEXTLINE(modernize-loop-convert)
  for (auto line = lines.rbegin(); line != lines.rend(); ++line) text += *line;
  return text;
}

}  // namespace

CaptureWriter::CaptureWriter(Dependencies dependencies)
    : dependencies_(std::move(dependencies)), archive_(dependencies_.log_directory) {}

void CaptureWriter::tidy() const { archive_.removeDrafts(); }

std::error_code CaptureWriter::write(const CaptureOrder& order) const {
  const std::uint64_t most = readCaptureSettings(dependencies_.settings, dependencies_.log).max_bytes;
  for (const std::string& name : archive_.keepWithin(most - kMostCaptureBytes)) {
    TAL_LOG_INFO(dependencies_.log, "removed the oldest capture to make room: ", name);
  }
  std::error_code error;
  if (const auto draft = archive_.begin(order.identifier, error)) {
    // First what changes fastest.
    if (order.with_scheduler) {
      draft->write("scheduler.txt", schedulerReport());
      if (const std::string trace = traceBuffer(); !trace.empty()) draft->write("trace.txt", trace);
    }
    draft->write("processes.txt", processReport(order.process_identifiers));
    draft->write("log.txt", dependencies_.log_ring.text());
    draft->write("system.txt", systemReport());
    if (order.context) draft->write("messages.jsonl", messagesFile(*order.context));
    draft->write("payload.json", jsonLine(order.payload.value_or(MessageDict())));
    draft->write("signature.json", signatureFile(order));
    error = draft->finish();
  }
  if (error) {
    TAL_LOG_ERROR(dependencies_.log, "capture ", order.identifier,
                  " could not be written and is left out: ", error.message());
  } else {
    TAL_LOG(dependencies_.log, "captured ", order.identifier);
  }
  return error;
}

std::string CaptureWriter::signatureFile(const CaptureOrder& order) const {
  return jsonLine({{"identifier", order.identifier},
                   {"kind", order.kind},
                   {"requested_at", MessageDate{order.requested_at}},
                   {"captured_at", MessageDate{dependencies_.clock.secondsSince1970()}},
                   {"session", order.context ? order.context->session : std::string()},
                   {"signature", order.signature}});
}

void CaptureWriter::keepThrottle(const std::string& text) const {
  if (const std::error_code error = replaceFile(throttlePath(), text)) {
    TAL_LOG_ERROR(dependencies_.log,
                  "the limits of captures will not outlive this process: ", error.message());
  }
}

std::string CaptureWriter::keptThrottle() const { return readProcFile(throttlePath().string()).value_or(""); }

}  // namespace tal
