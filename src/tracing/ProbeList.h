#pragma once

// Probe lists: from the dictionaries that a test client wrote to what the trace
// library understands.

#include <optional>
#include <string>
#include <vector>

#include "core/MessageValue.h"
#include "platform/SkeinTraceModel.h"

namespace tal {

/// One entry of a list, or why it is none.
struct ParsedProbe {
  std::optional<SkeinProbeDescription> description;
  std::string error;
};

/// {"name", "kind"} and, by kind, for "interval": "begin" and "end", and perhaps
/// "processes"; for "count": "events"; for "cpu" nothing more: `perf_processes`
/// says whom it watches. Lists may be given as one string.
ParsedProbe parseProbe(const MessageValue& entry, const std::vector<std::string>& perf_processes);

/// The strings of an array, or the one string; nothing for anything else.
std::optional<std::vector<std::string>> stringList(const MessageValue& value);

}  // namespace tal
