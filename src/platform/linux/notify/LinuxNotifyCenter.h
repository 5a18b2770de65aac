#pragma once

#include <filesystem>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "core/Log.h"
#include "platform/NotifyCenter.h"
#include "platform/linux/notify/NotifyDirectory.h"
#include "platform/linux/notify/NotifyFiles.h"
#include "platform/linux/process/BackgroundWork.h"

namespace tal {

/// Notifications as files of a directory that all programs see. Any thread.
///
/// 1. The constructor makes the directory `notify` in the runtime directory and
///    starts a thread that sleeps until something is posted there.
/// 2. Where that is refused, a line says so, and registrations fail.
/// 3. The destructor ends the thread; no handler is posted any more.
///
/// Posts of this process take the same road as those of others. A watcher that
/// is slow costs a counter, not a queue. When the kernel has lost count of
/// posts, or the directory has been replaced, every watcher whose notification
/// has ever been posted there is told once.
class LinuxNotifyCenter final : public NotifyCenter {
 public:
  /// `log` outlives the object.
  LinuxNotifyCenter(const std::filesystem::path& runtime_directory, const LogChannel& log);
  LinuxNotifyCenter(const LinuxNotifyCenter&) = delete;
  LinuxNotifyCenter& operator=(const LinuxNotifyCenter&) = delete;
  ~LinuxNotifyCenter() override;

  Registration registerDispatch(std::string_view name, SerialQueue& queue, Handler handler) override;
  State getState(Token token) override;
  NotifyStatus cancel(Token token) override;
  /// Does not wait: while other programs are posting, and after this one's own
  /// posts that wait for them, the post is made a moment later on another thread,
  /// which logs what fails.
  NotifyStatus post(std::string_view name, std::optional<std::uint64_t> state) override;

 private:
  struct Watcher;

  NotifyStatus postLater(std::string_view name, std::optional<std::uint64_t> state);
  NotifyStatus statusOf(std::string_view name, const std::optional<NotifyError>& error) const;
  void run();
  void tell(const NotifyDirectory::Changes& changes);
  static void tellOnce(const std::shared_ptr<Watcher>& watcher);
  static void postDelivery(const std::shared_ptr<Watcher>& watcher);

  const LogChannel& log_;
  NotifyDirectory directory_;
  std::mutex mutex_;
  Token last_token_ = 0;
  std::map<Token, std::shared_ptr<Watcher>> watchers_;
  std::thread thread_;  // last of the state that it uses
  BackgroundWork waiting_posts_{"notify-post"};
};

}  // namespace tal
