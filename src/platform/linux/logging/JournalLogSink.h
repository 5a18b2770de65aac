#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "core/Log.h"

namespace tal {

/// A sink for the system journal, or null in a build without its library. Any
/// thread; a journal that is away loses the line and nothing else.
std::unique_ptr<LogSink> makeJournalLogSink();

/// The fields of one line's journal entry, each "NAME=value": MESSAGE (the line
/// with its control characters escaped), PRIORITY (syslog's numbers),
/// SYSLOG_IDENTIFIER, TAL_CHANNEL, and CODE_FILE and CODE_LINE where the line
/// begins with the source prefix.
std::vector<std::string> journalFields(std::string_view channel, LogLevel level, std::string_view line);

}  // namespace tal
