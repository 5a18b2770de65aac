#pragma once

// What a client may do itself, by the permission bits of what it names.

#include <sys/stat.h>

#include <string>
#include <string_view>
#include <vector>

#include "platform/ClientIdentity.h"
#include "platform/linux/process/FileDescriptor.h"

namespace tal {

/// The bits of one class of users in a file's mode.
enum class Right : mode_t { kRead = 4, kWrite = 2, kSearch = 1 };

/// As the kernel decides by owner, group and others; access-control lists are not
/// looked at. Root may all.
bool mayDo(const ClientIdentity& client, const struct stat& file, Right right);

/// As the kernel decides for a file in the directory: with the sticky bit, its
/// owner or the directory's.
bool mayReplace(const ClientIdentity& client, const struct stat& directory, const struct stat& file);

/// The parts of an absolute path without "." and "..". Empty for any other path.
std::vector<std::string> partsOf(std::string_view path);

/// Goes down from the root directory by parts, as the client could. What it has
/// reached it holds open, so that nobody can put something else in its place.
class ClientWalk {
 public:
  enum class Step { kDone, kMissing, kRefused };

  explicit ClientWalk(const ClientIdentity& client);

  /// Into what bears the name, which is no symbolic link.
  Step enter(const std::string& name);
  /// Makes a directory that is missing, open to every user, and enters it.
  bool make(const std::string& name);

  int descriptor() const { return current_.get(); }
  const struct stat& status() const { return status_; }
  bool may(Right right) const { return mayDo(client_, status_, right); }
  /// Why the last step was refused.
  const std::string& error() const { return error_; }
  FileDescriptor release() { return std::move(current_); }

 private:
  bool take(FileDescriptor next, const std::string& name);

  const ClientIdentity& client_;
  FileDescriptor current_;
  struct stat status_ {};
  std::string error_;
};

}  // namespace tal
