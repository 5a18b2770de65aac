#pragma once

// `talctl settings`: reads both layers of a settings domain, writes the upper one.

#include <string>

#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// Prints the value that the daemon sees under the key (a string without quotes,
/// anything else as JSON) or, where `key` is empty, every key with its value and
/// its layer. Throws CommandFailure where the key is not set or a file does not
/// parse.
void runSettingsGet(const DaemonLocation& daemon, const std::string& domain, const std::string& key,
                    bool json, const Terminal& terminal);

/// Sets the key in the state layer, where it hides what the administrator set.
/// The value is written as on the command line of `send`. Run by root, it leaves
/// the file to the owner of the state directory.
void runSettingsSet(const DaemonLocation& daemon, const std::string& domain, const std::string& key,
                    const std::string& value);

}  // namespace tal::talctl
