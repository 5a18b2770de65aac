#include "platform/linux/settings/TomlFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string>
#include <system_error>
#include <utility>

#include "platform/linux/settings/TomlText.h"

namespace tal {

namespace {

// Far beyond what a person writes; keeps a misplaced file out of memory.
constexpr std::size_t kLargestFileBytes = 1024 * 1024;

std::int64_t nanosecondsOf(const timespec& time) {
  constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;
  return time.tv_sec * kNanosecondsPerSecond + time.tv_nsec;
}

// At most one byte more than allowed; nothing, with errno, on failure.
std::optional<std::string> readAll(int file) {
  std::string text;
  std::array<char, 4096> piece{};
  while (text.size() <= kLargestFileBytes) {
    const ssize_t size = ::read(file, piece.data(), piece.size());
    if (size == 0) break;
    if (size > 0) {
      text.append(piece.data(), static_cast<std::size_t>(size));
    } else if (errno != EINTR) {
      return std::nullopt;
    }
  }
  return text;
}

std::string reasonOf(int error) { return "cannot be read: " + std::generic_category().message(error); }

}  // namespace

TomlFile::Version TomlFile::versionOf(const struct ::stat& status) {
  return {status.st_dev, status.st_ino, status.st_size, nanosecondsOf(status.st_mtim),
          nanosecondsOf(status.st_ctim)};
}

void TomlFile::refresh() {
  struct stat status {};
  if (::stat(path_.c_str(), &status) == 0) {
    if (version_ == versionOf(status)) return;
    last_error_ = 0;
    read();
    return;
  }
  const int error = errno;
  const bool was_known = !version_ && last_error_ == error;
  version_.reset();
  if (was_known) return;
  last_error_ = error;
  if (error == ENOENT || error == ENOTDIR) {
    values_ = {};
    broken_ = false;
  } else {
    reject(reasonOf(error));
  }
}

void TomlFile::readAnew() {
  version_.reset();
  refresh();
}

void TomlFile::read() {
  const int file = ::open(path_.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  struct stat status {};
  std::optional<std::string> text;
  if (file >= 0 && ::fstat(file, &status) == 0) text = readAll(file);
  const int error = errno;
  if (file >= 0) ::close(file);
  // The version from before the reading: what is written meanwhile shows as a
  // change at the next look.
  if (file >= 0) {
    version_ = versionOf(status);
  } else if (::stat(path_.c_str(), &status) == 0) {
    version_ = versionOf(status);
  }
  if (!text) {
    reject(reasonOf(error));
  } else if (text->size() > kLargestFileBytes) {
    reject("is larger than 1 MiB");
  } else {
    adopt(*text);
  }
}

void TomlFile::adopt(std::string_view text) {
  auto parsed = parseToml(text);
  if (const auto* error = std::get_if<TomlError>(&parsed)) {
    reject("line " + std::to_string(error->line) + ", column " + std::to_string(error->column) + ": " +
           error->reason);
    return;
  }
  values_ = std::move(std::get<MessageDict>(parsed));
  broken_ = false;
}

void TomlFile::reject(std::string_view reason) {
  const bool is_known = broken_ && version_ && rejected_version_ == version_;
  values_ = {};
  broken_ = true;
  rejected_version_ = version_;
  if (is_known) return;
  TAL_LOG_ERROR(*log_, path_.string(), " is taken as empty: ", reason);
}

}  // namespace tal
