#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace tal {

/// Runs tools of the host. Any thread; several at a time.
class CommandShell {
 public:
  using Output = std::function<void(std::string_view bytes)>;

  virtual ~CommandShell() = default;

  /// Runs a command line through the host's shell and returns when it has ended.
  /// `output` is told, on this thread, what the command writes to its standard
  /// output, in pieces as they come. Programs that were installed with the
  /// service are found by their name alone. False when it could not be run.
  virtual bool run(const std::string& command_line, const Output& output) = 0;
};

}  // namespace tal
