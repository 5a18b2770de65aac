#include "tools/talctl/StoreWatch.h"

#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <string>
#include <string_view>
#include <system_error>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

namespace fs = std::filesystem;

constexpr std::uint32_t kGone = IN_DELETE_SELF | IN_MOVE_SELF | IN_IGNORED;
constexpr std::uint32_t kAppeared = IN_CREATE | IN_MOVED_TO;
constexpr std::uint32_t kInStore = kAppeared | IN_MODIFY | IN_MOVED_FROM | IN_DELETE;

CommandFailure systemFailure(const std::string& what) {
  return CommandFailure(what + ": " + std::generic_category().message(errno));
}

fs::path nearestExisting(fs::path directory) {
  std::error_code ignored;
  while (!fs::is_directory(directory, ignored) && directory.has_relative_path()) {
    directory = directory.parent_path();
  }
  return directory;
}

}  // namespace

StoreWatch::StoreWatch(const fs::path& store)
    : directory_(fs::absolute(store).lexically_normal().parent_path()),
      file_name_(store.filename()),
      inotify_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {
  if (inotify_ < 0) throw systemFailure("cannot watch the store");
  try {
    watchNearest();
  } catch (...) {
    close(inotify_);
    throw;
  }
}

StoreWatch::~StoreWatch() { close(inotify_); }

bool StoreWatch::watchNearest() {
  bool changed = false;
  // A directory can appear between the look and the watch: so look again until both agree.
  for (fs::path nearest; (nearest = nearestExisting(directory_)) != watched_;) {
    if (watch_ >= 0) inotify_rm_watch(inotify_, watch_);
    watched_.clear();
    const std::uint32_t mask = (nearest == directory_ ? kInStore : kAppeared) | kGone | IN_ONLYDIR;
    watch_ = inotify_add_watch(inotify_, nearest.c_str(), mask);
    if (watch_ < 0 && (errno == ENOENT || errno == ENOTDIR)) continue;
    if (watch_ < 0) throw systemFailure("cannot watch " + nearest.native());
    watched_ = nearest;
    changed = true;
  }
  return changed;
}

bool StoreWatch::takeNotices() {
  bool concerned = false;
  alignas(inotify_event) std::array<char, 8192> buffer;
  for (ssize_t size; (size = read(inotify_, buffer.data(), buffer.size())) > 0;) {
    for (std::size_t at = 0; at < static_cast<std::size_t>(size);) {
      const auto* notice = reinterpret_cast<const inotify_event*>(buffer.data() + at);
      at += sizeof *notice + notice->len;
      if (notice->mask & IN_Q_OVERFLOW) concerned = true;
      if (notice->wd != watch_) continue;  // of a directory watched before
      if (notice->mask & kGone) {
        watched_.clear();
        watch_ = -1;
        concerned = true;
        continue;
      }
      const std::string_view name = notice->len > 0 ? notice->name : "";
      // The index beside the log is memory that readers write, too: this program itself would wake itself.
      if (name.starts_with(file_name_) && !name.ends_with("-shm")) concerned = true;
    }
  }
  return watchNearest() || concerned;
}

StoreWatch::Woken StoreWatch::wait(std::optional<std::chrono::milliseconds> at_most, int output) {
  const auto deadline = std::chrono::steady_clock::now() + at_most.value_or(std::chrono::milliseconds(0));
  while (true) {
    std::array<pollfd, 2> descriptors = {
        {{.fd = inotify_, .events = POLLIN, .revents = 0}, {.fd = output, .events = 0, .revents = 0}}};
    int timeout_ms = -1;
    if (at_most) {
      const auto left =
          std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
      timeout_ms = left.count() > 0 ? static_cast<int>(left.count()) : 0;
    }
    const int ready = poll(descriptors.data(), descriptors.size(), timeout_ms);
    if (ready < 0 && errno != EINTR) throw systemFailure("cannot wait for the store");
    if (ready == 0) return Woken::kTimedOut;
    if (ready > 0 && descriptors[1].revents != 0) return Woken::kHungUp;
    if (ready > 0 && takeNotices()) return Woken::kWritten;
  }
}

std::optional<std::chrono::milliseconds> RecheckSchedule::take() {
  const auto now = next_;
  if (next_) next_ = *next_ * 2;
  if (next_ && *next_ > kLast) next_.reset();
  return now;
}

}  // namespace tal::talctl
