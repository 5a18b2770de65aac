#include "platform/linux/settings/AtomicFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <string>

namespace tal {

namespace {

std::error_code lastError() { return {errno, std::generic_category()}; }

std::error_code writeDurably(int file, std::string_view text, mode_t mode) {
  if (::fchmod(file, mode) != 0) return lastError();
  while (!text.empty()) {
    const ssize_t written = ::write(file, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      return lastError();
    }
  }
  return ::fsync(file) == 0 ? std::error_code() : lastError();
}

void syncDirectory(const std::filesystem::path& directory) {
  const int file = ::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (file < 0) return;
  // A file system that cannot do this keeps what it promises by itself.
  ::fsync(file);
  ::close(file);
}

}  // namespace

std::error_code replaceFile(const std::filesystem::path& path, std::string_view text, mode_t mode) {
  std::string temporary = path.string() + ".XXXXXX";
  const int file = ::mkostemp(temporary.data(), O_CLOEXEC);
  if (file < 0) return lastError();
  std::error_code error = writeDurably(file, text, mode);
  if (::close(file) != 0 && !error) error = lastError();
  if (!error && ::rename(temporary.c_str(), path.c_str()) != 0) error = lastError();
  if (error) {
    ::unlink(temporary.c_str());
  } else {
    syncDirectory(path.parent_path());
  }
  return error;
}

}  // namespace tal
