#include "platform/linux/process/InstanceLock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <system_error>

#include "platform/linux/process/StartupError.h"

namespace tal {

namespace {
constexpr mode_t kOwnerAndGroup = 0640;
}  // namespace

InstanceLock::InstanceLock(const std::filesystem::path& directory) {
  const std::string path = directory / "talreportingd.lock";
  file_ = ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, kOwnerAndGroup);
  if (file_ < 0) {
    throw StartupError("cannot open " + path + ": " + std::generic_category().message(errno));
  }
  if (::flock(file_, LOCK_EX | LOCK_NB) == 0) return;
  const int error = errno;
  ::close(file_);
  if (error == EWOULDBLOCK) throw StartupError("another talreportingd is running on " + directory.string());
  throw StartupError("cannot lock " + path + ": " + std::generic_category().message(error));
}

InstanceLock::~InstanceLock() { ::close(file_); }

}  // namespace tal
