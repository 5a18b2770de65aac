// Where PipeWire's socket is, and waiting for it to appear without polling.
#pragma once

#include <chrono>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// The name of the remote that a client connects to when it is told no other.
std::string remoteNameFrom(const std::function<const char*(const char*)>& environment);

/// The places where PipeWire's clients look for the socket of a remote, given a look-up of
/// environment variables (null for one that is not set).
std::vector<std::filesystem::path> remoteSocketPaths(
    const std::string& remoteName, const std::function<const char*(const char*)>& environment);

/// How long to wait before the next attempt to connect.
///
/// A socket appears a moment before somebody listens on it, and a refusal can pass: so attempts
/// follow an event with growing pauses, and end after kAttempts; then only another event is worth
/// an attempt, and nothing wakes up until then.
class ReconnectPacing {
 public:
  static constexpr std::chrono::milliseconds kFirstPause{50};
  /// 50 ms doubled 8 times: about 25 s in all.
  static constexpr int kAttempts = 9;
  static constexpr std::chrono::milliseconds kLongestPause = kFirstPause * (1 << (kAttempts - 1));

  /// The attempt failed. Absent: wait for an event.
  std::optional<std::chrono::milliseconds> pauseAfterFailure();

  /// The socket appeared, or a connection that worked was lost.
  void startOver() { failures_ = 0; }

 private:
  int failures_ = 0;
};

/// Tells when one of some paths may have appeared.
///
/// Watches the directory of each, or the nearest one above it that exists. Lives on the main
/// loop's thread.
class PathWatch {
 public:
  /// Starts watching. Throws std::system_error when the system cannot watch.
  explicit PathWatch(std::vector<std::filesystem::path> paths);
  ~PathWatch();
  PathWatch(const PathWatch&) = delete;
  PathWatch& operator=(const PathWatch&) = delete;

  /// Readable when something happened in a watched directory.
  int descriptor() const { return descriptor_; }

  /// Takes what happened. True when it may have made one of the paths appear. Does not block.
  bool takeEvents();

 private:
  void watchDirectories();

  std::vector<std::filesystem::path> paths_;
  int descriptor_;
};

}  // namespace tal
