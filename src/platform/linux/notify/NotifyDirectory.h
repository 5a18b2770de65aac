#pragma once

// What happens in the directory of notifications, as the kernel tells it.

#include <filesystem>
#include <string>
#include <system_error>
#include <vector>

#include "core/Log.h"

namespace tal {

/// Watches a notify directory, which it makes where it is missing, now and
/// whenever it goes. One thread at a time, but for `end`.
class NotifyDirectory {
 public:
  struct Changes {
    /// Names posted, in order; one that was posted twice is there twice.
    std::vector<std::string> posted;
    /// Posts may be missing from `posted`: more came than the kernel keeps, or
    /// the directory is another one than before.
    bool some_missed = false;
    /// `end` was called.
    bool ended = false;
  };

  /// Watches from here on. `log` outlives the object, and gets a line when the
  /// directory cannot be watched.
  NotifyDirectory(std::filesystem::path directory, const LogChannel& log);
  NotifyDirectory(const NotifyDirectory&) = delete;
  NotifyDirectory& operator=(const NotifyDirectory&) = delete;
  ~NotifyDirectory();

  /// False when the kernel gives no means to watch anything: nothing will ever be told.
  bool canWatch() const { return inotify_ >= 0 && end_ >= 0; }

  /// Sleeps until something has happened.
  Changes wait();

  /// Any thread: `wait` returns at once, now and from now on.
  void end() const;

  const std::filesystem::path& path() const { return path_; }

 private:
  void read(Changes& changes);
  bool takeEvent(int watch, std::uint32_t mask, std::string_view name, Changes& changes) const;
  bool watchAnew();
  void cannotWatch(const std::filesystem::path& what, const std::error_code& error);

  const std::filesystem::path path_;
  const LogChannel& log_;
  int inotify_;
  int end_;
  int parent_watch_ = -1;
  int watch_ = -1;
  bool trouble_is_logged_ = false;
};

}  // namespace tal
