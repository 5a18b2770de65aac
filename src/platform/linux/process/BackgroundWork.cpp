#include "platform/linux/process/BackgroundWork.h"

#include <pthread.h>
#include <sys/resource.h>

#include <system_error>
#include <utility>

namespace tal {

BackgroundWork::~BackgroundWork() {
  if (thread_.joinable()) thread_.join();
}

bool BackgroundWork::add(Task task) {
  const std::lock_guard lock(mutex_);
  if (tasks_.size() >= kMostWaiting) return false;
  tasks_.push_back(std::move(task));
  if (running_ || startThread()) return true;
  task = std::move(tasks_.back());
  tasks_.pop_back();
  return false;
}

bool BackgroundWork::idle() const {
  const std::lock_guard lock(mutex_);
  return tasks_.empty();
}

bool BackgroundWork::startThread() {
  // The thread before this one needs the lock no more.
  if (thread_.joinable()) thread_.join();
  try {
    thread_ = std::thread([this] { run(); });
  } catch (const std::system_error&) {
    return false;
  }
  running_ = true;
  return true;
}

void BackgroundWork::run() {
  pthread_setname_np(pthread_self(), thread_name_.c_str());
  // Not at the raised priority of a queue that may have started it.
  setpriority(PRIO_PROCESS, 0, 0);
  std::unique_lock lock(mutex_);
  while (!tasks_.empty()) {
    Task task = std::move(tasks_.front());
    lock.unlock();
    task();
    task = nullptr;  // what it holds ends with no lock held
    lock.lock();
    tasks_.pop_front();
  }
  running_ = false;
}

}  // namespace tal
