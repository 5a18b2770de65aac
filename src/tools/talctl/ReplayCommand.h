#pragma once

// `talctl replay`: carries out a recorded script.

#include <string>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// Carries out the script in `file`, "-" for standard input, and returns once
/// all that it caused is stored; sessions that it leaves started are then stopped
/// by the daemon. Prints what its look-ups find, one JSON object a line.
///
/// A script in a file is checked to its end before anything of it is carried out.
/// Standard input is carried out as it comes, up to the first bad line. Throws
/// UsageError or CommandFailure with the number of the line.
void runReplay(const DaemonLocation& daemon, const std::string& file, const Terminal& terminal);

}  // namespace tal::talctl
