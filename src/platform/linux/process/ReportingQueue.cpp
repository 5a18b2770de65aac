#include "platform/linux/process/ReportingQueue.h"

#include <pthread.h>
#include <sys/resource.h>

#include <algorithm>
#include <string>
#include <utility>

namespace tal {

namespace {

// The kernel's bound for thread names, without the end mark.
constexpr std::size_t kLongestThreadName = 15;
// A burst's vector is not kept for ever.
constexpr std::size_t kMostTasksKeptAllocated = 1024;

void nameAndRankThisThread(std::string_view label, int niceness) {
  if (label.size() > kLongestThreadName) label.remove_prefix(label.size() - kLongestThreadName);
  pthread_setname_np(pthread_self(), std::string(label).c_str());
  // Refused to ordinary users, who then get ordinary service.
  setpriority(PRIO_PROCESS, 0, niceness);
}

}  // namespace

ReportingQueue::ReportingQueue(std::string_view label, int niceness) {
  thread_ = std::thread([this, niceness, name = std::string(label)] {
    nameAndRankThisThread(name, niceness);
    run();
  });
  thread_id_ = thread_.get_id();
}

ReportingQueue::~ReportingQueue() { stopDropping(); }

void ReportingQueue::post(Task task) {
  bool wake = false;
  {
    const std::lock_guard lock(mutex_);
    // Past the end the task dies with the argument, outside the lock.
    if (ending_ != Ending::kNone) return;
    waiting_.push_back(std::move(task));
    wake = std::exchange(sleeping_, false);
  }
  if (wake) wake_.notify_one();
}

void ReportingQueue::postAfter(std::chrono::nanoseconds delay, Task task) {
  if (delay <= std::chrono::nanoseconds::zero()) return post(std::move(task));
  const TimePoint now = std::chrono::steady_clock::now();
  const TimePoint due = delay < TimePoint::max() - now ? now + delay : TimePoint::max();
  bool wake = false;
  {
    const std::lock_guard lock(mutex_);
    if (ending_ != Ending::kNone) return;
    const bool is_next = timers_.empty() || due < timers_.front().due;
    timers_.push_back({due, next_timer_number_++, std::move(task)});
    std::push_heap(timers_.begin(), timers_.end(), later);
    wake = is_next && std::exchange(sleeping_, false);
  }
  if (wake) wake_.notify_one();
}

bool ReportingQueue::isCurrent() const { return std::this_thread::get_id() == thread_id_; }

void ReportingQueue::stop() { end(Ending::kAfterPosted); }

void ReportingQueue::stopDropping() { end(Ending::kAtOnce); }

void ReportingQueue::end(Ending ending) {
  {
    const std::lock_guard lock(mutex_);
    ending_ = std::max(ending_.load(), ending);
    sleeping_ = false;
  }
  wake_.notify_one();
  if (thread_.joinable()) thread_.join();
  // Destroyed here and unlocked, since a task's destructor may post.
  std::vector<Task> unrun;
  std::vector<Timer> not_due;
  const std::lock_guard lock(mutex_);
  unrun.swap(waiting_);
  not_due.swap(timers_);
}

bool ReportingQueue::later(const Timer& a, const Timer& b) {
  return a.due != b.due ? a.due > b.due : a.number > b.number;
}

void ReportingQueue::run() {
  std::vector<Task> batch;
  std::unique_lock lock(mutex_);
  while (ending_ != Ending::kAtOnce) {
    takeDueTimers();
    if (waiting_.empty()) {
      if (ending_ != Ending::kNone) return;
      sleep(lock);
      continue;
    }
    batch.swap(waiting_);
    lock.unlock();
    runBatch(batch);
    lock.lock();
  }
}

void ReportingQueue::runBatch(std::vector<Task>& batch) {
  for (Task& task : batch) {
    if (ending_.load(std::memory_order_relaxed) == Ending::kAtOnce) break;
    task();
    task = nullptr;  // what it holds must not outlive its turn
  }
  batch.clear();
  if (batch.capacity() > kMostTasksKeptAllocated) std::vector<Task>().swap(batch);
}

void ReportingQueue::takeDueTimers() {
  if (timers_.empty()) return;
  const TimePoint now = std::chrono::steady_clock::now();
  while (!timers_.empty() && timers_.front().due <= now) {
    std::pop_heap(timers_.begin(), timers_.end(), later);
    waiting_.push_back(std::move(timers_.back().task));
    timers_.pop_back();
  }
}

void ReportingQueue::sleep(std::unique_lock<std::mutex>& lock) {
  sleeping_ = true;
  if (timers_.empty()) {
    wake_.wait(lock);
  } else {
    const TimePoint due = timers_.front().due;  // the heap moves while the lock is off
    wake_.wait_until(lock, due);
  }
  sleeping_ = false;
}

}  // namespace tal
