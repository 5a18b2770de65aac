#pragma once

// Spans of time as people type them.

#include <chrono>
#include <string_view>

namespace tal::talctl {

/// "500ms", "90s", "10m", "2h", "7d", "1w", or several of these in a row: "1h30m".
/// Throws UsageError for anything else, and for more than a hundred years.
std::chrono::milliseconds parseDuration(std::string_view text);

}  // namespace tal::talctl
