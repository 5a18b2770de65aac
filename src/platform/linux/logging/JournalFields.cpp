// What a journal entry holds, apart from the library that sends it.

#include <algorithm>
#include <optional>
#include <utility>

#include "platform/linux/logging/JournalLogSink.h"
#include "platform/linux/logging/LogLine.h"

namespace tal {

namespace {

char syslogPriority(LogLevel level) {
  switch (level) {
    case LogLevel::kError:
      return '3';
    case LogLevel::kDefault:
      return '5';  // a normal, but significant condition
    case LogLevel::kInfo:
      return '6';
    case LogLevel::kDebug:
      return '7';
  }
  return '5';
}

std::string_view untilBlank(std::string_view text) { return text.substr(0, text.find(' ')); }

// The name and number of "     TalReportingService:123   text".
std::optional<std::pair<std::string_view, std::string_view>> sourceOf(std::string_view line) {
  line.remove_prefix(std::min(line.find_first_not_of(' '), line.size()));
  const std::string_view source = untilBlank(line);
  const std::size_t colon = source.find(':');
  if (colon == std::string_view::npos || colon == 0) return std::nullopt;
  const std::string_view number = source.substr(colon + 1);
  const auto isDigit = [](char c) { return c >= '0' && c <= '9'; };
  if (number.empty() || !std::all_of(number.begin(), number.end(), isDigit)) return std::nullopt;
  return std::pair(source.substr(0, colon), number);
}

}  // namespace

std::vector<std::string> journalFields(std::string_view channel, LogLevel level, std::string_view line) {
  std::vector<std::string> fields;
  fields.reserve(6);
  appendEscaped(fields.emplace_back("MESSAGE="), line);
  fields.emplace_back("PRIORITY=") += syslogPriority(level);
  fields.emplace_back("SYSLOG_IDENTIFIER=talreportingd");
  fields.emplace_back("TAL_CHANNEL=") += channel;
  if (const auto source = sourceOf(line)) {
    fields.emplace_back("CODE_FILE=") += source->first;
    fields.emplace_back("CODE_LINE=") += source->second;
  }
  return fields;
}

}  // namespace tal
