#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <filesystem>
#include <optional>

#include "core/Log.h"
#include "core/MessageDict.h"

namespace tal {

/// The content of a TOML file that people edit while the daemon runs. A file
/// that cannot be read or does not parse is logged once for each state that it
/// is found in, with line and column, and reads as empty. One thread at a time.
class TomlFile {
 public:
  /// `log` must outlive the object. Reads nothing yet.
  TomlFile(std::filesystem::path path, const LogChannel& log) : path_(std::move(path)), log_(&log) {}

  /// Looks whether the file has changed since the last look, and reads it anew if so.
  void refresh();

  /// Reads the file even if it seems to be the same: two changes within one tick
  /// of the file system's clock can look alike.
  void readAnew();

  /// What the last look found; empty when there is no file.
  const MessageDict& values() const { return values_; }

  /// True when there is a file that did not read: it must not be written over.
  bool isBroken() const { return broken_; }

  const std::filesystem::path& path() const { return path_; }

 private:
  // Differs whenever the content may differ.
  struct Version {
    dev_t device;
    ino_t inode;
    off_t size;
    std::int64_t modified_ns;
    std::int64_t changed_ns;
    bool operator==(const Version&) const = default;
  };
  static Version versionOf(const struct ::stat& status);

  void read();
  void adopt(std::string_view text);
  void reject(std::string_view reason);

  std::filesystem::path path_;
  const LogChannel* log_;
  std::optional<Version> version_;
  std::optional<Version> rejected_version_;
  int last_error_ = 0;
  MessageDict values_;
  bool broken_ = false;
};

}  // namespace tal
