#pragma once

// The two ways in which a command can end badly. `main` alone catches them: it
// prints the one line and picks the exit status.

#include <stdexcept>
#include <string>

namespace tal::talctl {

/// The command was understood but could not be done: exit status 1.
struct CommandFailure : std::runtime_error {
  using std::runtime_error::runtime_error;
};

/// The command line, or a line of a script, makes no sense: exit status 2.
struct UsageError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

}  // namespace tal::talctl
