#pragma once

// `talctl perf`: shows what performance traces of test sessions measured.

#include <string>
#include <string_view>
#include <vector>

#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// Prints the metrics of one results file, or those of two side by side with what
/// changed from the first to the second in per cent. Throws CommandFailure for a
/// file that is none, UsageError for another number of them.
void runPerfShow(const std::vector<std::string>& files, const Terminal& terminal);

/// The same as text, from the files' contents. `names` are what the files are
/// called in failures and headings.
std::string perfText(const std::vector<std::string>& names, const std::vector<std::string>& contents,
                     Width width);

}  // namespace tal::talctl
