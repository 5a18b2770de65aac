#pragma once

// Rare work that waits for disks or other programs, done beside the queue that
// asked for it.

#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace tal {

/// Runs tasks one after the other on a thread that is there only while there are
/// any. Any thread.
///
/// The destructor runs what still waits. A task must not destroy the object.
class BackgroundWork {
 public:
  using Task = std::function<void()>;

  /// More than any sane burst: whoever gets here does not come to an end.
  static constexpr std::size_t kMostWaiting = 1000;

  /// `thread_name` is at most 15 bytes.
  explicit BackgroundWork(std::string thread_name) : thread_name_(std::move(thread_name)) {}
  BackgroundWork(const BackgroundWork&) = delete;
  BackgroundWork& operator=(const BackgroundWork&) = delete;
  ~BackgroundWork();

  /// False when too much waits already, or the system gives no thread: the task
  /// is destroyed unrun.
  [[nodiscard]] bool add(Task task);

  /// True when nothing waits or runs.
  bool idle() const;

 private:
  bool startThread();
  void run();

  const std::string thread_name_;
  mutable std::mutex mutex_;
  std::deque<Task> tasks_;  // the first one may be running
  bool running_ = false;
  std::thread thread_;  // joinable from its start until the next one's
};

}  // namespace tal
