#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace tal {

/// A file that is being written. One thread.
class DiagnosticFile {
 public:
  /// The reason, in words; nothing on success.
  using Error = std::optional<std::string>;

  /// A file that was not closed is closed without an answer.
  virtual ~DiagnosticFile() = default;

  /// Bytes may stay in memory until `close`, which then tells of their failure. A
  /// failure is told once, and what is written after it is dropped: a full disk is
  /// one line in the log, however much there was to write.
  virtual Error write(std::string_view bytes) = 0;
  virtual Error close() = 0;
};

/// The device's diagnostic-log directory, where engineers look for what went
/// wrong. Any thread; each call may wait for the disk.
class DiagnosticLog {
 public:
  struct Opened {
    std::unique_ptr<DiagnosticFile> file;  ///< null on failure
    std::string error;
  };

  virtual ~DiagnosticLog() = default;

  /// The full path of a place below the directory, such as "Audio/Reporting".
  virtual std::string pathOf(std::string_view place) const = 0;

  /// Makes the place and all directories above it, open to every user (0777)
  /// whatever the process's mask.
  virtual DiagnosticFile::Error makeDirectory(std::string_view place) = 0;

  /// Creates a file that does not exist yet. Since everyone may write to these
  /// directories, no link is followed and nothing that exists is opened.
  virtual Opened createFile(std::string_view place, std::string_view name) = 0;

  /// Writes a file elsewhere and moves it into the place when it is whole: neither a
  /// full disk nor the end of the process leaves half of it under its name.
  virtual DiagnosticFile::Error putFile(std::string_view place, std::string_view name,
                                        std::string_view text) = 0;

  /// Removes files that are the daemon's own from the place, the first by name first,
  /// until there are `most`. Files that it began to put and never finished go before all others.
  virtual void keepLast(std::string_view place, std::size_t most) = 0;
};

}  // namespace tal
