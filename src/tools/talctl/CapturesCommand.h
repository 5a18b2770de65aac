#pragma once

// What the daemon captured of the machine when it saw a fault. Reads files; needs
// no running daemon.

#include <string>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// The captures, the oldest first: a table, or one JSON object a line.
void runCaptures(const DaemonLocation& daemon, bool json, const Terminal& terminal);

/// One capture, every file under its name; of a trace its size alone. With `file`
/// that file as it is. Throws CommandFailure where there is no such capture or file.
void runCapturesShow(const DaemonLocation& daemon, const std::string& identifier, const std::string& file,
                     const Terminal& terminal);

}  // namespace tal::talctl
