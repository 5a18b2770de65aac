#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "platform/linux/diagnostic_log/BufferedFile.h"

namespace tal {

namespace {

namespace fs = std::filesystem;

constexpr mode_t kOpenToEveryone = 0777;
constexpr mode_t kReadByEveryone = 0644;

std::string reasonOf(int error) { return std::generic_category().message(error); }

/// A directory that is held open, so that nobody can put another in its place.
class Directory {
 public:
  explicit Directory(int descriptor) : descriptor_(descriptor) {}
  Directory(const Directory&) = delete;
  Directory& operator=(const Directory&) = delete;
  Directory(Directory&& other) noexcept : descriptor_(std::exchange(other.descriptor_, -1)) {}
  Directory& operator=(Directory&& other) noexcept {
    std::swap(descriptor_, other.descriptor_);
    return *this;
  }
  ~Directory() {
    if (descriptor_ >= 0) ::close(descriptor_);
  }

  static Directory open(const fs::path& path) {
    return Directory(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  }
  Directory below(const fs::path& name) const {
    return Directory(::openat(descriptor_, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  }

  bool isOpen() const { return descriptor_ >= 0; }
  int descriptor() const { return descriptor_; }

 private:
  int descriptor_;
};

}  // namespace

DiagnosticFile::Error LinuxDiagnosticLog::makeDirectory(std::string_view place) {
  Directory directory = Directory::open(root_);
  for (const fs::path& part : fs::path(place)) {
    if (!directory.isOpen()) break;
    const bool made = ::mkdirat(directory.descriptor(), part.c_str(), kOpenToEveryone) == 0;
    if (!made && errno != EEXIST) return reasonOf(errno);
    directory = directory.below(part);
    // Once more, since the process's mask has taken its part away.
    if (made && directory.isOpen() && ::fchmod(directory.descriptor(), kOpenToEveryone) != 0)
      return reasonOf(errno);
  }
  if (!directory.isOpen()) return reasonOf(errno);
  return std::nullopt;
}

DiagnosticLog::Opened LinuxDiagnosticLog::createFile(std::string_view place, std::string_view name) {
  Directory directory = Directory::open(root_);
  for (const fs::path& part : fs::path(place)) {
    if (directory.isOpen()) directory = directory.below(part);
  }
  if (!directory.isOpen()) return {nullptr, reasonOf(errno)};
  const int descriptor = ::openat(directory.descriptor(), std::string(name).c_str(),
                                  O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kReadByEveryone);
  if (descriptor < 0) return {nullptr, reasonOf(errno)};
  return {std::make_unique<BufferedFile>(descriptor), ""};
}

}  // namespace tal
