#pragma once

// `talctl report`: who played and recorded what, how long, how loud, with what trouble.

#include <string>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

struct ReportOptions {
  std::string since;  ///< A duration; empty: all that is stored.
  std::string html;   ///< A file, "-" for standard output; empty: text.
};

/// Prints the report, or writes it as one page that needs nothing else. The store is only read, and the
/// daemon need not run. Throws CommandFailure where there is no store or the page cannot be written.
void runReport(const DaemonLocation& daemon, const ReportOptions& options, const Terminal& terminal);

}  // namespace tal::talctl
