#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/linux/diagnostic_log/BufferedFile.h"

namespace tal {

namespace {

namespace fs = std::filesystem;

constexpr mode_t kOpenToEveryone = 0777;
constexpr mode_t kReadByEveryone = 0644;
// Sorts before every name that begins with a digit or a letter.
constexpr std::string_view kUnfinishedPrefix = ".unfinished-";

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

  /// A place below the root of the log; where it is not open, `errno` says why.
  static Directory openPlace(const fs::path& root, std::string_view place) {
    Directory directory = open(root);
    for (const fs::path& part : fs::path(place)) {
      if (directory.isOpen()) directory = directory.below(part);
    }
    return directory;
  }

  bool isOpen() const { return descriptor_ >= 0; }
  int descriptor() const { return descriptor_; }

 private:
  int descriptor_;
};

int createIn(const Directory& directory, const std::string& name) {
  return ::openat(directory.descriptor(), name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                  kReadByEveryone);
}

// Everyone may write there: what others have put is theirs to remove.
bool isOwnFile(const Directory& directory, const char* name) {
  struct stat status {};
  return ::fstatat(directory.descriptor(), name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
         S_ISREG(status.st_mode) && status.st_uid == ::geteuid();
}

std::vector<std::string> ownFilesIn(const Directory& directory) {
  std::vector<std::string> names;
  // A descriptor of its own, since closedir closes it.
  const int own = ::openat(directory.descriptor(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* stream = own < 0 ? nullptr : ::fdopendir(own);
  if (!stream) {
    if (own >= 0) ::close(own);
    return names;
  }
  while (const dirent* entry = ::readdir(stream)) {
    if (isOwnFile(directory, entry->d_name)) names.emplace_back(entry->d_name);
  }
  ::closedir(stream);
  return names;
}

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
  const Directory directory = Directory::openPlace(root_, place);
  if (!directory.isOpen()) return {nullptr, reasonOf(errno)};
  const int descriptor = createIn(directory, std::string(name));
  if (descriptor < 0) return {nullptr, reasonOf(errno)};
  return {std::make_unique<BufferedFile>(descriptor), ""};
}

DiagnosticFile::Error LinuxDiagnosticLog::putFile(std::string_view place, std::string_view name,
                                                  std::string_view text) {
  const Directory directory = Directory::openPlace(root_, place);
  if (!directory.isOpen()) return reasonOf(errno);
  const std::string final_name(name);
  const std::string unfinished = std::string(kUnfinishedPrefix) + final_name;
  const int descriptor = createIn(directory, unfinished);
  if (descriptor < 0) return reasonOf(errno);
  BufferedFile file(descriptor);
  DiagnosticFile::Error error = file.write(text);
  if (DiagnosticFile::Error at_close = file.close(); !error) error = std::move(at_close);
  if (!error && ::renameat(directory.descriptor(), unfinished.c_str(), directory.descriptor(),
                           final_name.c_str()) != 0) {
    error = reasonOf(errno);
  }
  if (error) ::unlinkat(directory.descriptor(), unfinished.c_str(), 0);
  return error;
}

void LinuxDiagnosticLog::keepLast(std::string_view place, std::size_t most) {
  const Directory directory = Directory::openPlace(root_, place);
  if (!directory.isOpen()) return;
  std::vector<std::string> names = ownFilesIn(directory);
  if (names.size() <= most) return;
  std::sort(names.begin(), names.end());
  names.resize(names.size() - most);
  for (const std::string& name : names) ::unlinkat(directory.descriptor(), name.c_str(), 0);
}

}  // namespace tal
