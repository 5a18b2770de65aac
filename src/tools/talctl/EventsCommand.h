#pragma once

// `talctl events`: what the daemon has stored, and what it is storing.

#include <cstdint>
#include <optional>
#include <string>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

struct EventsOptions {
  bool follow = false;
  bool json = false;
  std::string name_glob;               ///< Empty: every name.
  std::string since;                   ///< A duration; empty: from the beginning.
  std::optional<std::uint64_t> count;  ///< The newest so many.
};

/// Prints the events, oldest first. With `follow` it goes on with new ones as
/// they are committed, however often the daemon or its store goes and comes, and
/// returns when nobody reads the output any longer.
void runEvents(const DaemonLocation& daemon, const EventsOptions& options, const Terminal& terminal);

}  // namespace tal::talctl
