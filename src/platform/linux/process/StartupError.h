#pragma once

#include <stdexcept>

namespace tal {

/// The daemon cannot start: `what()` is one clear line for the person who
/// started it. Thrown only while `main` builds the system, caught only there,
/// and ends in exit status 1. Everything else is handled where it happens.
class StartupError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

}  // namespace tal
