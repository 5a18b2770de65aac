#include "reporters/pipewire/RemoteSocket.h"

#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <system_error>
#include <utility>

namespace tal {

namespace {

constexpr const char* kDefaultRemote = "pipewire-0";
/// Where a PipeWire that serves all users has its socket.
constexpr const char* kSystemDirectory = "/run/pipewire";

bool isSet(const char* value) { return value && *value != '\0'; }

std::filesystem::path nearestExistingDirectory(std::filesystem::path path) {
  std::error_code ignored;
  while (path.has_relative_path() && !std::filesystem::is_directory(path, ignored)) path = path.parent_path();
  return path;
}

}  // namespace

std::string remoteNameFrom(const std::function<const char*(const char*)>& environment) {
  const char* name = environment("PIPEWIRE_REMOTE");
  return isSet(name) ? name : kDefaultRemote;
}

std::vector<std::filesystem::path> remoteSocketPaths(
    const std::string& remoteName, const std::function<const char*(const char*)>& environment) {
  if (remoteName.starts_with('/')) return {remoteName};
  std::vector<std::filesystem::path> paths;
  for (const char* variable : {"PIPEWIRE_RUNTIME_DIR", "XDG_RUNTIME_DIR", "USERPROFILE"}) {
    if (const char* directory = environment(variable); isSet(directory)) {
      paths.push_back(std::filesystem::path(directory) / remoteName);
      break;
    }
  }
  paths.push_back(std::filesystem::path(kSystemDirectory) / remoteName);
  return paths;
}

std::optional<std::chrono::milliseconds> ReconnectPacing::pauseAfterFailure() {
  if (failures_ >= kAttempts) return std::nullopt;
  return kFirstPause * (1 << failures_++);
}

PathWatch::PathWatch(std::vector<std::filesystem::path> paths)
    : paths_(std::move(paths)), descriptor_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
  if (descriptor_ < 0) throw std::system_error(errno, std::generic_category(), "inotify_init1");
  watchDirectories();
}

PathWatch::~PathWatch() { close(descriptor_); }

void PathWatch::watchDirectories() {
  for (const auto& path : paths_) {
    const std::filesystem::path directory = nearestExistingDirectory(path.parent_path());
    // Watching a directory again only confirms the watch. One that cannot be watched, perhaps
    // because it was removed just now, leaves the others.
    inotify_add_watch(descriptor_, directory.c_str(), IN_CREATE | IN_MOVED_TO | IN_ONLYDIR);
  }
}

bool PathWatch::takeEvents() {
  alignas(inotify_event) std::array<char, 4096> buffer;
  bool interesting = false;
  for (;;) {
    const ssize_t bytes = read(descriptor_, buffer.data(), buffer.size());
    if (bytes <= 0) break;
    for (ssize_t offset = 0; offset < bytes;) {
      inotify_event event;
      std::memcpy(&event, buffer.data() + offset, sizeof event);
      const char* name = event.len > 0 ? buffer.data() + offset + sizeof event : "";
      for (const auto& path : paths_) {
        for (const auto& part : path) interesting = interesting || part == name;
      }
      offset += static_cast<ssize_t>(sizeof event + event.len);
    }
  }
  // A directory that appeared may be one to watch from now on.
  watchDirectories();
  return interesting;
}

}  // namespace tal
