#include "platform/linux/notify/LinuxNotifyCenter.h"

#include <pthread.h>

#include <atomic>
#include <system_error>
#include <utility>

namespace tal {

struct LinuxNotifyCenter::Watcher {
  const std::string name;
  const Token token;
  SerialQueue& queue;
  const Handler handler;
  /// Posts that the handler has not been called for yet. While there are any,
  /// one task for this watcher waits on the queue.
  std::atomic<std::uint64_t> untold{0};
};

LinuxNotifyCenter::LinuxNotifyCenter(const std::filesystem::path& runtime_directory, const LogChannel& log)
    : log_(log), directory_(runtime_directory / kNotifyFolder, log) {
  if (!directory_.canWatch()) return;
  thread_ = std::thread([this] {
    pthread_setname_np(pthread_self(), "notify");
    run();
  });
}

LinuxNotifyCenter::~LinuxNotifyCenter() {
  if (!thread_.joinable()) return;
  directory_.end();
  thread_.join();
}

NotifyCenter::Registration LinuxNotifyCenter::registerDispatch(std::string_view name, SerialQueue& queue,
                                                               Handler handler) {
  if (!isNotificationName(name)) return {NotifyStatus::kInvalidName, kNoToken};
  if (!directory_.canWatch()) return {NotifyStatus::kFailed, kNoToken};
  const std::lock_guard lock(mutex_);
  const Token token = ++last_token_;
  // An aggregate that cannot be moved. NOLINTNEXTLINE(modernize-make-shared)
  std::shared_ptr<Watcher> watcher(new Watcher{std::string(name), token, queue, std::move(handler)});
  watchers_[token] = std::move(watcher);
  return {NotifyStatus::kOk, token};
}

NotifyCenter::State LinuxNotifyCenter::getState(Token token) {
  std::shared_ptr<Watcher> watcher;
  {
    const std::lock_guard lock(mutex_);
    const auto found = watchers_.find(token);
    if (found == watchers_.end()) return {NotifyStatus::kInvalidToken, 0};
    watcher = found->second;
  }
  const auto state = readNotificationState(directory_.path(), watcher->name);
  if (const auto* error = std::get_if<NotifyError>(&state)) {
    TAL_LOG_ERROR(log_, "the state of notification ", watcher->name, " was not read: ", error->reason);
    return {NotifyStatus::kFailed, 0};
  }
  return {NotifyStatus::kOk, std::get<std::uint64_t>(state)};
}

NotifyStatus LinuxNotifyCenter::cancel(Token token) {
  std::shared_ptr<Watcher> gone;  // its handler is destroyed with no lock held
  const std::lock_guard lock(mutex_);
  const auto found = watchers_.find(token);
  if (found == watchers_.end()) return NotifyStatus::kInvalidToken;
  gone = std::move(found->second);
  watchers_.erase(found);
  return NotifyStatus::kOk;
}

NotifyStatus LinuxNotifyCenter::post(std::string_view name, std::optional<std::uint64_t> state) {
  if (!isNotificationName(name)) return NotifyStatus::kInvalidName;
  if (!waiting_posts_.idle()) return postLater(name, state);  // posts keep their order
  const auto posted = postNotificationAtOnce(directory_.path(), name, state);
  if (const auto* error = std::get_if<NotifyError>(&posted)) return statusOf(name, *error);
  return std::get<bool>(posted) ? NotifyStatus::kOk : postLater(name, state);
}

NotifyStatus LinuxNotifyCenter::postLater(std::string_view name, std::optional<std::uint64_t> state) {
  const bool waits = waiting_posts_.add([this, name = std::string(name), state] {
    statusOf(name, postNotification(directory_.path(), name, state));
  });
  return waits ? NotifyStatus::kOk : statusOf(name, NotifyError{"too many posts wait for other programs"});
}

NotifyStatus LinuxNotifyCenter::statusOf(std::string_view name,
                                         const std::optional<NotifyError>& error) const {
  if (!error) return NotifyStatus::kOk;
  TAL_LOG_ERROR(log_, "notification ", name, " was not posted: ", error->reason);
  return NotifyStatus::kFailed;
}

void LinuxNotifyCenter::run() {
  while (true) {
    const NotifyDirectory::Changes changes = directory_.wait();
    if (changes.ended) return;
    tell(changes);
  }
}

// Under the lock throughout, so that a cancelled watcher's queue is left alone.
void LinuxNotifyCenter::tell(const NotifyDirectory::Changes& changes) {
  const std::lock_guard lock(mutex_);
  for (const std::string& name : changes.posted) {
    for (const auto& [token, watcher] : watchers_) {
      if (watcher->name == name) tellOnce(watcher);
    }
  }
  if (!changes.some_missed) return;
  for (const auto& [token, watcher] : watchers_) {
    std::error_code ignored;
    const auto file = std::filesystem::symlink_status(directory_.path() / watcher->name, ignored);
    // Without a file nobody has posted, and nothing can have been missed.
    if (std::filesystem::exists(file)) tellOnce(watcher);
  }
}

void LinuxNotifyCenter::tellOnce(const std::shared_ptr<Watcher>& watcher) {
  if (watcher->untold.fetch_add(1) == 0) postDelivery(watcher);
}

// One call a task, so that a burst does not keep the queue's other work waiting.
void LinuxNotifyCenter::postDelivery(const std::shared_ptr<Watcher>& watcher) {
  watcher->queue.post([weak = std::weak_ptr<Watcher>(watcher)] {
    const std::shared_ptr<Watcher> held = weak.lock();
    if (!held) return;  // cancelled
    const bool more = held->untold.fetch_sub(1) > 1;
    held->handler(held->token);
    if (more) postDelivery(held);
  });
}

}  // namespace tal
