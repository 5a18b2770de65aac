#pragma once

// Tools of the host through /bin/sh.

#include <filesystem>
#include <string>
#include <vector>

#include "platform/CommandShell.h"

namespace tal {

/// Any thread. Commands have no standard input and the caller's standard error.
class LinuxCommandShell final : public CommandShell {
 public:
  /// Programs are looked for in `program_directory` first, then where the
  /// environment says.
  explicit LinuxCommandShell(const std::filesystem::path& program_directory);

  /// A command line that the shell cannot find or execute could not be run.
  bool run(const std::string& command_line, const Output& output) override;

  /// Where the running program was installed; empty when that is unknown.
  static std::filesystem::path ownProgramDirectory();

 private:
  std::vector<std::string> environment_;
};

}  // namespace tal
