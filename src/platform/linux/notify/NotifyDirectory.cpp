#include "platform/linux/notify/NotifyDirectory.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <utility>

#include "platform/linux/notify/NotifyFiles.h"

namespace tal {

namespace {

// A post is a file moved into place, or written there by someone in a hurry. The
// kernel merges an event into an equal one just before it that nobody has read;
// the other events, which every way of posting causes in between, keep two posts
// of one name apart.
constexpr std::uint32_t kPosts = IN_MOVED_TO | IN_CLOSE_WRITE;
constexpr std::uint32_t kBetweenPosts = IN_MOVED_FROM | IN_MODIFY;
constexpr std::uint32_t kDirectoryGone = IN_DELETE_SELF | IN_MOVE_SELF;
// The parent tells of the directory's end and return: a directory that another
// process still has open does not tell that it was removed.
constexpr std::uint32_t kParentEvents = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO;

// Room for some hundred events of usual names, and for one of the longest.
constexpr std::size_t kBufferBytes = std::size_t{16} * 1024;
static_assert(kBufferBytes > sizeof(inotify_event) + NAME_MAX + 1);

std::error_code lastError() { return {errno, std::generic_category()}; }

}  // namespace

NotifyDirectory::NotifyDirectory(std::filesystem::path directory, const LogChannel& log)
    : path_(std::move(directory)),
      log_(log),
      inotify_(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC)),
      end_(::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC)) {
  if (canWatch()) {
    watchAnew();
  } else {
    cannotWatch(path_, lastError());
  }
}

NotifyDirectory::~NotifyDirectory() {
  if (inotify_ >= 0) ::close(inotify_);
  if (end_ >= 0) ::close(end_);
}

NotifyDirectory::Changes NotifyDirectory::wait() {
  Changes changes;
  std::array<pollfd, 2> sources{{{inotify_, POLLIN, 0}, {end_, POLLIN, 0}}};
  if (::poll(sources.data(), sources.size(), -1) < 0) return changes;  // a signal; nothing has happened
  changes.ended = sources[1].revents != 0;
  if (sources[0].revents != 0) read(changes);
  return changes;
}

void NotifyDirectory::end() const {
  const std::uint64_t one = 1;
  // Cannot fail: the counter is never read, and one or two do not fill it.
  [[maybe_unused]] const ssize_t written = ::write(end_, &one, sizeof one);
}

void NotifyDirectory::read(Changes& changes) {
  alignas(inotify_event) std::array<char, kBufferBytes> buffer;
  const ssize_t size = ::read(inotify_, buffer.data(), buffer.size());
  bool directory_moved = false;
  for (std::size_t at = 0; size > 0 && at < static_cast<std::size_t>(size);) {
    inotify_event event{};
    std::memcpy(&event, buffer.data() + at, sizeof event);
    // Padded with NULs.
    const char* name = event.len == 0 ? "" : buffer.data() + at + sizeof event;
    directory_moved |= takeEvent(event.wd, event.mask, name, changes);
    at += sizeof event + event.len;
  }
  if (directory_moved && watchAnew()) changes.some_missed = true;
}

// True when the directory may be another one now.
bool NotifyDirectory::takeEvent(int watch, std::uint32_t mask, std::string_view name,
                                Changes& changes) const {
  if ((mask & IN_Q_OVERFLOW) != 0) {
    changes.some_missed = true;
    return true;  // its end may be among what was lost
  }
  if (watch == parent_watch_) return (mask & IN_IGNORED) != 0 || name == path_.filename().string();
  if (watch != watch_) return false;  // of a directory that has been given up
  if ((mask & (kDirectoryGone | IN_IGNORED)) != 0) return true;
  if ((mask & kPosts) != 0 && isNotificationName(name)) changes.posted.emplace_back(name);
  return false;
}

// True when the directory is another one than before. The parent is watched
// first, so that nothing that happens to the directory meanwhile goes unseen.
bool NotifyDirectory::watchAnew() {
  const std::filesystem::path parent = path_.parent_path();
  parent_watch_ = ::inotify_add_watch(inotify_, parent.c_str(), kParentEvents | IN_ONLYDIR);
  if (parent_watch_ < 0) cannotWatch(parent, lastError());
  const std::error_code not_made = makeNotifyDirectory(path_);
  const int watch = not_made ? -1
                             : ::inotify_add_watch(inotify_, path_.c_str(),
                                                   kPosts | kBetweenPosts | kDirectoryGone | IN_ONLYDIR);
  if (watch < 0) {
    cannotWatch(path_, not_made ? not_made : lastError());
  } else {
    trouble_is_logged_ = false;
  }
  if (watch == watch_) return false;
  // Moved away, it would go on telling what is posted there. Already gone otherwise.
  if (watch_ >= 0) ::inotify_rm_watch(inotify_, watch_);
  watch_ = watch;
  return watch >= 0;
}

void NotifyDirectory::cannotWatch(const std::filesystem::path& what, const std::error_code& error) {
  if (std::exchange(trouble_is_logged_, true)) return;
  TAL_LOG_ERROR(log_, "notifications are not received: ", what.string(),
                " cannot be watched: ", error.message());
}

}  // namespace tal
