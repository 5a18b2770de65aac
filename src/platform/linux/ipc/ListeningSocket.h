#pragma once

// The socket that clients connect to: made here, or inherited from the service
// manager.

#include <sys/types.h>

#include <filesystem>
#include <optional>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

/// Owns the socket and, where it was made here, its file.
class ListeningSocket {
 public:
  /// Listens on `path`, which anybody may connect to. A file that a daemon that
  /// is gone has left there is replaced; the socket of one that lives, or a file
  /// of any other kind, is not touched. Throws StartupError.
  explicit ListeningSocket(const std::filesystem::path& path);

  /// Takes over a socket that listens already; its file is somebody else's.
  explicit ListeningSocket(FileDescriptor inherited) : socket_(std::move(inherited)) {}

  ListeningSocket(ListeningSocket&& other) noexcept
      : socket_(std::move(other.socket_)), own_(std::exchange(other.own_, std::nullopt)) {}
  ListeningSocket& operator=(ListeningSocket&&) = delete;

  /// Removes the file, unless somebody has put another one there meanwhile.
  ~ListeningSocket() { removeFile(); }
  void removeFile();

  /// Hands the descriptor over; the file stays this object's.
  int releaseSocket() { return socket_.release(); }

 private:
  struct OwnFile {
    std::filesystem::path path;
    dev_t device;
    ino_t inode;
  };

  FileDescriptor socket_;
  std::optional<OwnFile> own_;
};

}  // namespace tal
