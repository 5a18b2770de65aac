#pragma once

// Waiting for commits to a store that another process writes, without polling.

#include <chrono>
#include <filesystem>
#include <optional>

namespace tal::talctl {

/// Notices writes to a store's files, whether or not they or their directories
/// exist yet. One thread.
///
/// A writer's commit becomes visible to readers a little after its last write to
/// a file: whoever was woken has to look again for a while (RecheckSchedule).
class StoreWatch {
 public:
  /// Throws CommandFailure where the system has no watches left.
  explicit StoreWatch(const std::filesystem::path& store);
  ~StoreWatch();
  StoreWatch(const StoreWatch&) = delete;
  StoreWatch& operator=(const StoreWatch&) = delete;

  enum class Woken { kWritten, kTimedOut, kHungUp };

  /// Waits for a write since the construction or the last call, for the end of
  /// the time, or until nobody reads `output`, a file descriptor, any longer.
  /// Throws CommandFailure where the directory may not be watched.
  Woken wait(std::optional<std::chrono::milliseconds> at_most, int output);

 private:
  /// Watches the store's directory or, as long as that is missing, the nearest
  /// one above it. True when that has changed.
  bool watchNearest();
  /// Reads what has happened; true when any of it concerns the store.
  bool takeNotices();

  std::filesystem::path directory_;
  std::string file_name_;
  int inotify_;
  int watch_ = -1;
  std::filesystem::path watched_;
};

/// When to look again after a write was noticed: soon at first, then ever more
/// seldom, and not at all once it is long past. A plain value.
class RecheckSchedule {
 public:
  /// A write was noticed.
  void restart() { next_ = kFirst; }
  /// How long to wait before the next look; nothing: until there is a notice.
  std::optional<std::chrono::milliseconds> take();

 private:
  static constexpr std::chrono::milliseconds kFirst{2};
  // A disk that takes longer than this to make a commit durable is about to fail.
  static constexpr std::chrono::milliseconds kLast{8192};

  std::optional<std::chrono::milliseconds> next_;
};

}  // namespace tal::talctl
