#include "platform/linux/notify/NotifyFiles.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <chrono>
#include <random>
#include <thread>

namespace tal {

namespace {

constexpr std::size_t kLongestName = 255;
// 2^64 has 20 digits; leaves room for a line end and shows when there is more.
constexpr std::size_t kLongestContent = 32;
constexpr mode_t kDirectoryMode = 0775;
// The daemon reads what root posts, whatever the poster's umask.
constexpr mode_t kFileMode = 0644;
// Begins with a dot, as no notification's name does.
constexpr std::string_view kUnfinishedPrefix = ".post-";
// Often enough to find a gap between the turns of a program that posts without
// a pause; not for ever, as whoever may read the directory may hold its lock.
constexpr int kMostLockAttempts = 300;
constexpr std::chrono::milliseconds kBetweenLockAttempts{1};

std::string lastError() { return std::generic_category().message(errno); }

class File {
 public:
  explicit File(int descriptor) : descriptor_(descriptor) {}
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  ~File() {
    if (descriptor_ >= 0) ::close(descriptor_);
  }
  bool isOpen() const { return descriptor_ >= 0; }
  int descriptor() const { return descriptor_; }

 private:
  int descriptor_;
};

int openDirectory(const std::filesystem::path& directory) {
  return ::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
}

std::optional<std::uint64_t> parseState(std::string_view text) {
  while (!text.empty() && (text.back() == '\n' || text.back() == ' ')) text.remove_suffix(1);
  std::uint64_t state = 0;
  const char* const end = text.data() + text.size();
  const auto [parsed_to, error] = std::from_chars(text.data(), end, state);
  if (error != std::errc() || parsed_to != end) return std::nullopt;
  return state;
}

std::variant<std::uint64_t, NotifyError> readState(int directory, const std::string& name) {
  // A fifo must not block, and a link must not lead elsewhere.
  const File file(::openat(directory, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (!file.isOpen()) {
    if (errno == ENOENT) return std::uint64_t{0};
    return NotifyError{lastError()};
  }
  struct stat status {};
  if (::fstat(file.descriptor(), &status) != 0) return NotifyError{lastError()};
  if (!S_ISREG(status.st_mode)) return NotifyError{"is not a file"};
  std::array<char, kLongestContent> content{};
  const ssize_t size = ::read(file.descriptor(), content.data(), content.size());
  if (size < 0) return NotifyError{lastError()};
  const std::string_view text(content.data(), static_cast<std::size_t>(size));
  const auto state = text.size() < content.size() ? parseState(text) : std::nullopt;
  if (state) return *state;
  return NotifyError{"holds no decimal number of 64 bits"};
}

// Posters take turns, so that one that keeps the state does not bring back what
// another has just replaced. Where somebody sits on the lock, posting goes on
// without: that would otherwise silence every notification.
void waitForTurn(int directory) {
  for (int attempt = 0; attempt < kMostLockAttempts; ++attempt) {
    if (::flock(directory, LOCK_EX | LOCK_NB) == 0) return;
    std::this_thread::sleep_for(kBetweenLockAttempts);
  }
}

bool takeTurnAtOnce(int directory) {
  return ::flock(directory, LOCK_EX | LOCK_NB) == 0 || errno != EWOULDBLOCK;
}

// A name that no other poster uses, whatever program or container it lives in.
std::string unfinishedName() {
  std::random_device random;
  return std::string(kUnfinishedPrefix) + std::to_string(random()) + '-' + std::to_string(random());
}

bool writeNew(int directory, const std::string& name, const std::string& content) {
  const File file(
      ::openat(directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileMode));
  if (!file.isOpen() || ::fchmod(file.descriptor(), kFileMode) != 0) return false;
  const ssize_t written = ::write(file.descriptor(), content.data(), content.size());
  if (written >= 0 && static_cast<std::size_t>(written) != content.size()) errno = ENOSPC;
  return written == static_cast<ssize_t>(content.size());
}

/// One post, made once it is this poster's turn, which ends with the object.
class Poster {
 public:
  Poster(const std::filesystem::path& directory, std::string_view name)
      : path_(directory.string()), name_(name), error_(makeReady(directory)) {}

  /// Why nothing can be posted.
  const std::optional<NotifyError>& error() const { return error_; }
  int directory() const { return opened_->descriptor(); }
  std::optional<NotifyError> post(std::optional<std::uint64_t> state) const;

 private:
  std::optional<NotifyError> makeReady(const std::filesystem::path& directory) {
    if (!isNotificationName(name_)) return NotifyError{"is no name of a notification"};
    if (const std::error_code error = makeNotifyDirectory(directory))
      return NotifyError{path_ + ": " + error.message()};
    opened_.emplace(openDirectory(directory));
    if (!opened_->isOpen()) return NotifyError{path_ + ": " + lastError()};
    return std::nullopt;
  }

  const std::string path_;
  const std::string name_;
  std::optional<File> opened_;
  const std::optional<NotifyError> error_;  // last: made of the others
};

std::optional<NotifyError> Poster::post(std::optional<std::uint64_t> state) const {
  if (!state) {
    const auto kept = readState(directory(), name_);
    if (const auto* error = std::get_if<NotifyError>(&kept))
      return NotifyError{"its state cannot be kept: " + error->reason};
    state = std::get<std::uint64_t>(kept);
  }
  const std::string unfinished = unfinishedName();
  if (writeNew(directory(), unfinished, std::to_string(*state)) &&
      ::renameat(directory(), unfinished.c_str(), directory(), name_.c_str()) == 0) {
    return std::nullopt;
  }
  const std::string reason = lastError();
  ::unlinkat(directory(), unfinished.c_str(), 0);
  return NotifyError{path_ + ": " + reason};
}

}  // namespace

bool isNotificationName(std::string_view name) {
  return !name.empty() && name.size() <= kLongestName && name.front() != '.' &&
         name.find('/') == std::string_view::npos && name.find('\0') == std::string_view::npos;
}

std::error_code makeNotifyDirectory(const std::filesystem::path& directory) {
  const auto error = [] { return std::error_code(errno, std::generic_category()); };
  if (::mkdir(directory.c_str(), kDirectoryMode) != 0) return errno == EEXIST ? std::error_code() : error();
  // Through the descriptor: root, who may post too, must not be led elsewhere.
  const File made(::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat parent {};
  if (!made.isOpen() || ::fchmod(made.descriptor(), kDirectoryMode) != 0 ||
      ::fstatat(made.descriptor(), "..", &parent, 0) != 0) {
    return error();
  }
  const bool may_give_away = ::geteuid() == 0;
  if (may_give_away && ::fchown(made.descriptor(), parent.st_uid, parent.st_gid) != 0) return error();
  return {};
}

std::variant<std::uint64_t, NotifyError> readNotificationState(const std::filesystem::path& directory,
                                                               std::string_view name) {
  if (!isNotificationName(name)) return NotifyError{"is no name of a notification"};
  const File opened(openDirectory(directory));
  if (opened.isOpen()) return readState(opened.descriptor(), std::string(name));
  if (errno == ENOENT) return std::uint64_t{0};
  return NotifyError{lastError()};
}

std::optional<NotifyError> postNotification(const std::filesystem::path& directory, std::string_view name,
                                            std::optional<std::uint64_t> state) {
  const Poster poster(directory, name);
  if (poster.error()) return poster.error();
  waitForTurn(poster.directory());
  return poster.post(state);
}

std::variant<bool, NotifyError> postNotificationAtOnce(const std::filesystem::path& directory,
                                                       std::string_view name,
                                                       std::optional<std::uint64_t> state) {
  const Poster poster(directory, name);
  if (poster.error()) return *poster.error();
  if (!takeTurnAtOnce(poster.directory())) return false;
  if (auto error = poster.post(state)) return std::move(*error);
  return true;
}

}  // namespace tal
