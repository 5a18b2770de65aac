#pragma once

// Where the daemon keeps its things.

#include <filesystem>
#include <functional>
#include <optional>
#include <string>

namespace tal {

struct Directories {
  std::filesystem::path config;
  std::filesystem::path state;
  std::filesystem::path runtime;
  std::filesystem::path log;

  std::filesystem::path socket() const { return runtime / "talreporting.sock"; }

  friend bool operator==(const Directories&, const Directories&) = default;
};

/// What the command line says of them.
struct DirectoryOptions {
  std::optional<std::filesystem::path> root = {};
  std::optional<std::filesystem::path> config = {};
  std::optional<std::filesystem::path> state = {};
  std::optional<std::filesystem::path> runtime = {};
  std::optional<std::filesystem::path> log = {};
};

/// The variable's value, or nothing when it is not set or empty.
using Environment = std::function<std::optional<std::string>(const char* name)>;

/// A directory that is named by itself comes first, then the root directory,
/// then the system's directories for root and the user's own for others. All
/// are absolute. Throws StartupError when there is no telling.
Directories chooseDirectories(const DirectoryOptions& options, bool as_root, const Environment& environment);

/// Makes those that are missing: state and log for the daemon's user and group
/// alone. Those that exist are left as they are. Throws StartupError.
void makeDirectories(const Directories& directories);

}  // namespace tal
