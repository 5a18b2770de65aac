#pragma once

// Which daemon a command is about: its socket and its directories.

#include <filesystem>
#include <optional>
#include <string>

namespace tal::talctl {

/// Where one daemon lives.
struct DaemonLocation {
  std::filesystem::path socket;
  /// Absent where only the socket is known, and it is at none of the usual places.
  std::optional<std::filesystem::path> state_directory;
  std::optional<std::filesystem::path> config_directory;
  std::optional<std::filesystem::path> log_directory;

  std::filesystem::path storePath() const;
  std::filesystem::path capturesPath() const;
  /// Where notifications are posted, whether it is there already or not.
  std::filesystem::path notifyDirectory() const;
  /// The two layers of a settings domain.
  std::filesystem::path stateSettingsPath(const std::string& domain) const;
  std::filesystem::path configSettingsPath(const std::string& domain) const;
};

/// What the command line says about it; at most one of the two is set.
struct LocationOptions {
  std::string root;
  std::string socket;
};

/// The daemon under `--root`; the one at `--socket` or, without either, at
/// TALREPORTING_SOCKET; else the user's or the system's: the first that answers,
/// or without any, the first whose store exists, or the one that this user would
/// start.
DaemonLocation locateDaemon(const LocationOptions& options);

}  // namespace tal::talctl
