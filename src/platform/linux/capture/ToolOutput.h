#pragma once

// Runs a tool of the system for what it prints.

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace tal {

/// What the command printed, at most 8 MiB of it. Nothing when it is not there,
/// fails, or is not done in time: then it is ended. Waits for it on this thread.
std::optional<std::string> toolOutput(const std::vector<std::string>& command,
                                      std::chrono::milliseconds at_most);

}  // namespace tal
