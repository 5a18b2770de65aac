#include "platform/linux/ipc/ListeningSocket.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "platform/linux/process/StartupError.h"

namespace tal {

namespace {

constexpr mode_t kAnybodyMayConnect = 0666;
// Connections that wait to be accepted; the kernel's own bound is usually lower.
constexpr int kBacklog = 4096;

[[noreturn]] void fail(const std::filesystem::path& path, const std::string& what, int error) {
  throw StartupError("socket " + path.string() + ": " + what + (error != 0 ? ": " : "") +
                     (error != 0 ? std::strerror(error) : ""));
}

sockaddr_un addressOf(const std::filesystem::path& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const std::string& name = path.native();
  if (name.size() >= sizeof address.sun_path) fail(path, "the path is too long for a socket", 0);
  std::memcpy(address.sun_path, name.c_str(), name.size() + 1);
  return address;
}

const sockaddr* generic(const sockaddr_un& address) { return reinterpret_cast<const sockaddr*>(&address); }

FileDescriptor newSocket(const std::filesystem::path& path) {
  FileDescriptor made(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!made) fail(path, "cannot be made", errno);
  return made;
}

// Only a refused connection proves that nobody listens any more: any other
// answer can come from a daemon that lives.
void removeIfDead(const std::filesystem::path& path, const sockaddr_un& address) {
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0) {
    if (errno == ENOENT) return;
    fail(path, "cannot be looked at", errno);
  }
  if (!S_ISSOCK(status.st_mode)) fail(path, "there is a file of another kind", 0);
  const FileDescriptor probe = newSocket(path);
  const int result = ::connect(probe.get(), generic(address), sizeof address);
  if (result == 0 || errno != ECONNREFUSED) fail(path, "another daemon listens on it", 0);
  if (::unlink(path.c_str()) != 0 && errno != ENOENT) fail(path, "what is left of it stays", errno);
}

}  // namespace

ListeningSocket::ListeningSocket(const std::filesystem::path& path) {
  const sockaddr_un address = addressOf(path);
  removeIfDead(path, address);
  socket_ = newSocket(path);
  if (::bind(socket_.get(), generic(address), sizeof address) != 0) fail(path, "cannot be bound", errno);
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0) fail(path, "cannot be looked at", errno);
  own_ = OwnFile{path, status.st_dev, status.st_ino};
  if (::chmod(path.c_str(), kAnybodyMayConnect) != 0) fail(path, "cannot be opened to all", errno);
  if (::listen(socket_.get(), kBacklog) != 0) fail(path, "cannot listen", errno);
}

void ListeningSocket::removeFile() {
  if (!own_) return;
  struct stat status {};
  const bool still_own = ::lstat(own_->path.c_str(), &status) == 0 && status.st_dev == own_->device &&
                         status.st_ino == own_->inode;
  if (still_own) ::unlink(own_->path.c_str());
  own_.reset();
}

}  // namespace tal
