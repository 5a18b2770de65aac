#pragma once

// `talctl notify`: posts notifications to whoever watches them.

#include <optional>
#include <string>

#include "tools/talctl/DaemonLocation.h"

namespace tal::talctl {

/// Posts one, with a state (a decimal number of 64 bits without a sign) or with
/// the one that it has. No daemon need run. Throws UsageError for a name or a
/// state that is none, CommandFailure where it cannot be posted.
void runNotifyPost(const DaemonLocation& daemon, const std::string& name,
                   const std::optional<std::string>& state);

}  // namespace tal::talctl
