#pragma once

// Dates as people and other programs read them: RFC 3339, UTC, microseconds.

#include <string>

namespace tal {

/// Appends "2026-01-31T14:45:02.123456Z". A time outside the years 0000 to 9999,
/// or none at all (NaN), is held at the nearest that RFC 3339 can write (NaN at
/// 1970).
void appendRfc3339(std::string& out, double seconds_since_1970);

}  // namespace tal
