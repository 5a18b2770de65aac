#pragma once

// What log sinks make of a line that may hold text from a client.

#include <string>
#include <string_view>

#include "core/Log.h"

namespace tal {

/// Appends the text with every control character (C0, DEL, C1) and every byte
/// that is no UTF-8 escaped ("\n", "\t", "\x1b", …), so that no client can forge
/// a line or drive a terminal. Backslashes stay as they are.
void appendEscaped(std::string& out, std::string_view text);

/// Appends "2026-01-31T14:45:02.123456Z talrs default       TalReportingService:123   text"
/// with the line escaped and a line end.
void appendLogLine(std::string& out, double seconds_since_1970, std::string_view channel, LogLevel level,
                   std::string_view line);

}  // namespace tal
