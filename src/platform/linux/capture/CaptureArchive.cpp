#include "platform/linux/capture/CaptureArchive.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <utility>

namespace tal {

namespace {

constexpr std::string_view kDraftPrefix = ".draft-";
constexpr mode_t kOwnAndGroup = 0750;
constexpr mode_t kFileOwnAndGroup = 0640;
// As everything makes this one that needs it.
constexpr mode_t kOpenToEveryone = 0777;

std::error_code lastError() { return {errno, std::generic_category()}; }

FileDescriptor openDirectory(int parent, const std::string& name) {
  return FileDescriptor(::openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

FileDescriptor openOrMake(int parent, const std::string& name, mode_t mode, bool create) {
  const bool made = create && ::mkdirat(parent, name.c_str(), mode) == 0;
  if (create && !made && errno != EEXIST) return {};
  FileDescriptor directory = openDirectory(parent, name);
  // Once more, since the process's mask has taken its part away.
  if (made && directory && ::fchmod(directory.get(), mode) != 0) return {};
  return directory;
}

std::vector<std::string> namesIn(int directory) {
  std::vector<std::string> names;
  // A descriptor of its own, since closedir closes it.
  const int own = ::openat(directory, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* stream = own < 0 ? nullptr : ::fdopendir(own);
  if (!stream) {
    if (own >= 0) ::close(own);
    return names;
  }
  while (const dirent* entry = ::readdir(stream)) {
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") names.emplace_back(name);
  }
  ::closedir(stream);
  return names;
}

// Captures are flat: whatever else somebody has put there makes the last step fail.
void removeCapture(int archive, const std::string& name) {
  if (const FileDescriptor directory = openDirectory(archive, name)) {
    for (const std::string& file : namesIn(directory.get())) ::unlinkat(directory.get(), file.c_str(), 0);
  }
  ::unlinkat(archive, name.c_str(), AT_REMOVEDIR);
}

std::uint64_t bytesIn(int directory) {
  std::uint64_t bytes = 0;
  for (const std::string& file : namesIn(directory)) {
    struct stat status {};
    if (::fstatat(directory, file.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0) {
      bytes += static_cast<std::uint64_t>(status.st_size);
    }
  }
  return bytes;
}

// "20260131T144502Z-…"
bool isCaptureName(std::string_view name) {
  constexpr std::string_view kForm =
      "dddddddd"
      "T"
      "dddddd"
      "Z-";
  if (name.size() <= kForm.size()) return false;
  for (std::size_t i = 0; i < kForm.size(); ++i) {
    const bool digit = std::isdigit(static_cast<unsigned char>(name[i])) != 0;
    if (kForm[i] == 'd' ? !digit : name[i] != kForm[i]) return false;
  }
  return true;
}

std::error_code writeWhole(int file, std::string_view text) {
  if (::fchmod(file, kFileOwnAndGroup) != 0) return lastError();
  while (!text.empty()) {
    const ssize_t written = ::write(file, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return lastError();
    text.remove_prefix(static_cast<std::size_t>(written));
  }
  return ::fsync(file) == 0 ? std::error_code() : lastError();
}

}  // namespace

CaptureDraft::CaptureDraft(FileDescriptor archive, FileDescriptor directory, std::string temporary_name,
                           std::string final_name)
    : archive_(std::move(archive)),
      directory_(std::move(directory)),
      temporary_name_(std::move(temporary_name)),
      final_name_(std::move(final_name)) {}

CaptureDraft::~CaptureDraft() {
  if (!finished_) removeCapture(archive_.get(), temporary_name_);
}

void CaptureDraft::write(const std::string& name, std::string_view text) {
  if (error_) return;
  const FileDescriptor file(::openat(directory_.get(), name.c_str(),
                                     O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileOwnAndGroup));
  error_ = file ? writeWhole(file.get(), text) : lastError();
}

std::error_code CaptureDraft::finish() {
  if (!error_ && ::fsync(directory_.get()) != 0) error_ = lastError();
  // Never replaces anything: what has the name already holds files.
  if (!error_ &&
      ::renameat(archive_.get(), temporary_name_.c_str(), archive_.get(), final_name_.c_str()) != 0)
    error_ = lastError();
  finished_ = !error_;
  if (finished_) ::fsync(archive_.get());
  return error_;
}

FileDescriptor CaptureArchive::open(bool create, std::error_code& error) const {
  const FileDescriptor log(::open(log_directory_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  FileDescriptor audio;
  FileDescriptor captures;
  if (log) audio = openOrMake(log.get(), "Audio", kOpenToEveryone, create);
  if (audio) captures = openOrMake(audio.get(), "Captures", kOwnAndGroup, create);
  if (!captures) {
    error = lastError();
    return {};
  }
  // Everyone may put one in its place: captures go into the daemon's own alone.
  struct stat status {};
  if (::fstat(captures.get(), &status) != 0 || status.st_uid != ::geteuid()) {
    error = std::make_error_code(std::errc::operation_not_permitted);
    return {};
  }
  return captures;
}

std::unique_ptr<CaptureDraft> CaptureArchive::begin(const std::string& name, std::error_code& error) const {
  FileDescriptor archive = open(/*create=*/true, error);
  if (!archive) return nullptr;
  std::string temporary_name(kDraftPrefix);
  temporary_name += name;
  if (::mkdirat(archive.get(), temporary_name.c_str(), kOwnAndGroup) != 0) {
    error = lastError();
    return nullptr;
  }
  FileDescriptor directory = openDirectory(archive.get(), temporary_name);
  if (!directory || ::fchmod(directory.get(), kOwnAndGroup) != 0) {
    error = lastError();
    removeCapture(archive.get(), temporary_name);
    return nullptr;
  }
  return std::make_unique<CaptureDraft>(std::move(archive), std::move(directory), std::move(temporary_name),
                                        name);
}

void CaptureArchive::removeDrafts() const {
  std::error_code none_yet;
  const FileDescriptor archive = open(/*create=*/false, none_yet);
  if (!archive) return;
  for (const std::string& name : namesIn(archive.get())) {
    if (name.starts_with(kDraftPrefix)) removeCapture(archive.get(), name);
  }
}

std::vector<std::string> CaptureArchive::keepWithin(std::uint64_t bytes) const {
  struct Capture {
    std::string name;
    std::uint64_t bytes;
  };
  std::vector<std::string> removed;
  std::error_code none_yet;
  const FileDescriptor archive = open(/*create=*/false, none_yet);
  if (!archive) return removed;
  std::vector<Capture> captures;
  std::uint64_t total = 0;
  for (const std::string& name : namesIn(archive.get())) {
    if (!isCaptureName(name)) continue;
    const FileDescriptor directory = openDirectory(archive.get(), name);
    if (!directory) continue;
    captures.push_back({name, bytesIn(directory.get())});
    total += captures.back().bytes;
  }
  std::sort(captures.begin(), captures.end(),
            [](const Capture& a, const Capture& b) { return a.name < b.name; });
  for (const Capture& capture : captures) {
    if (total <= bytes) break;
    const std::string doomed = std::string(kDraftPrefix) + capture.name;
    if (::renameat(archive.get(), capture.name.c_str(), archive.get(), doomed.c_str()) != 0) continue;
    removeCapture(archive.get(), doomed);
    total -= capture.bytes;
    removed.push_back(capture.name);
  }
  return removed;
}

}  // namespace tal
