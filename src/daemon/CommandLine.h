#pragma once

#include <filesystem>
#include <string>
#include <variant>

#include "core/Log.h"
#include "daemon/Directories.h"

namespace tal {

struct DaemonOptions {
  enum class LogTo { kStderr, kJournal };

  DirectoryOptions directories;
  /// Where /proc and /sys of the device are looked for.
  std::filesystem::path host_root = "/";
  LogLevel log_level = LogLevel::kDefault;
  LogTo log_to = LogTo::kStderr;
};

/// Nothing is to be started: the process ends with this status. What there was
/// to say has been said.
struct ExitStatus {
  int value = 0;
};

inline constexpr int kExitWrongUsage = 2;

/// Answers --help and --version, and complains about what it does not understand.
std::variant<DaemonOptions, ExitStatus> parseCommandLine(int argument_count, const char* const* arguments,
                                                         const std::string& version);

}  // namespace tal
