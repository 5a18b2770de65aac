#pragma once

// Files that a client names. The system may do more than the client may, so each
// is opened with the client's rights in mind, not with the system's.

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/ClientIdentity.h"
#include "platform/DiagnosticLog.h"

namespace tal {

/// A directory for results, held open, so that nobody can put another in its
/// place. One thread.
class ResultsDirectory {
 public:
  using Error = DiagnosticFile::Error;

  virtual ~ResultsDirectory() = default;

  /// A new file, in the place of one of that name.
  virtual DiagnosticLog::Opened createFile(std::string_view name) = 0;
  /// Within the directory. Replaces what the client could replace itself.
  virtual Error move(std::string_view from, std::string_view to) = 0;
};

/// Paths are absolute and hold no symbolic link and no "..": anything else is
/// refused. A client without an identity may nothing. Any thread; each call may
/// wait for the disk.
class ClientFiles {
 public:
  struct Contents {
    std::optional<std::string> bytes;  ///< nothing on failure
    std::string error;
  };
  struct OpenedDirectory {
    std::unique_ptr<ResultsDirectory> directory;  ///< null on failure
    std::string error;
  };

  virtual ~ClientFiles() = default;

  /// The whole of a regular file that the client may read, of at most so many bytes.
  virtual Contents read(const ClientIdentity* client, std::string_view path, std::size_t most_bytes) = 0;

  /// A directory that the client may write. What is missing of it is made, open
  /// to every user (0777) whatever the process's mask, below a directory that the
  /// client may write.
  virtual OpenedDirectory openDirectory(const ClientIdentity* client, std::string_view path) = 0;

  /// A directory below the diagnostic-log directory that exists already.
  virtual OpenedDirectory openDiagnosticDirectory(std::string_view place) = 0;
};

}  // namespace tal
