#include "daemon/Directories.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <system_error>

#include "platform/linux/process/StartupError.h"

namespace tal {

namespace fs = std::filesystem;

namespace {

constexpr mode_t kOwnAndGroup = 0750;
constexpr mode_t kEverybodyReads = 0755;

fs::path userDirectory(const Environment& environment, const char* variable, const char* below_home,
                       const char* option) {
  if (const auto value = environment(variable)) return fs::path(*value) / "talreporting";
  const auto home = environment("HOME");
  if (!home || !below_home) {
    throw StartupError(std::string(variable) + " is not set: use --" + option + " or --root");
  }
  return fs::path(*home) / below_home / "talreporting";
}

void makeDirectory(const fs::path& path, mode_t mode) {
  if (fs::is_directory(path)) return;
  if (path.has_parent_path() && path.parent_path() != path)
    makeDirectory(path.parent_path(), kEverybodyReads);
  // Another process may be making the same one.
  if (::mkdir(path.c_str(), mode) != 0) {
    if (errno == EEXIST && fs::is_directory(path)) return;
    throw StartupError("directory " + path.string() + " cannot be made: " + std::strerror(errno));
  }
  // Not what the process's mask made of it.
  if (::chmod(path.c_str(), mode) != 0) {
    throw StartupError("directory " + path.string() + ": " + std::strerror(errno));
  }
}

}  // namespace

Directories chooseDirectories(const DirectoryOptions& options, bool as_root, const Environment& environment) {
  const auto choose = [&](const std::optional<fs::path>& named, const char* below_root, const char* of_system,
                          const auto& of_user) {
    const fs::path chosen = named          ? *named
                            : options.root ? *options.root / below_root
                            : as_root      ? fs::path(of_system)
                                           : of_user();
    return fs::absolute(chosen).lexically_normal();
  };
  const auto user_state = [&] {
    return userDirectory(environment, "XDG_STATE_HOME", ".local/state", "state-dir");
  };
  return {
      .config =
          choose(options.config, "config", "/etc/talreporting",
                 [&] { return userDirectory(environment, "XDG_CONFIG_HOME", ".config", "config-dir"); }),
      .state = choose(options.state, "state", "/var/lib/talreporting", user_state),
      .runtime =
          choose(options.runtime, "run", "/run/talreporting",
                 [&] { return userDirectory(environment, "XDG_RUNTIME_DIR", nullptr, "runtime-dir"); }),
      .log = choose(options.log, "log", "/var/log/talreporting", [&] { return user_state() / "log"; }),
  };
}

void makeDirectories(const Directories& directories) {
  makeDirectory(directories.config, kEverybodyReads);
  makeDirectory(directories.state, kOwnAndGroup);
  makeDirectory(directories.runtime, kEverybodyReads);
  makeDirectory(directories.log, kOwnAndGroup);
}

}  // namespace tal
