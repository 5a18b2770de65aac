#pragma once

// A report for a terminal.

#include <string>

#include "tools/talctl/Terminal.h"
#include "tools/talctl/report/AudioReport.h"

namespace tal::talctl {

/// Headings and tables that fit the terminal's width; every line ends with "\n".
std::string reportText(const AudioReport& report, const Terminal& terminal);

}  // namespace tal::talctl
