#pragma once

// The commands that are one short talk with the daemon: `talctl status`, `send`
// and `kill`.

#include <cstdint>
#include <string>
#include <vector>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// Prints the daemon's version and place, and every client's reporters. Throws
/// CommandFailure where no daemon answers, after saying so in JSON if asked to.
void runStatus(const DaemonLocation& daemon, bool json, const Terminal& terminal);

struct SendOptions {
  std::string category;
  std::string type;
  std::vector<std::int64_t> reporters;  ///< Empty: every started session.
  std::vector<std::string> values;      ///< "key=value"
};

/// Sends one message and returns once all that it caused is stored.
void runSend(const DaemonLocation& daemon, const SendOptions& options);

/// Ends the daemon and returns once it has closed its connections.
void runKill(const DaemonLocation& daemon);

}  // namespace tal::talctl
