#include "platform/linux/process/ElasticQueuePool.h"

#include <pthread.h>

#include <algorithm>
#include <utility>

namespace tal {

namespace {

// What is posted within this time after the last work needs no wake-up.
constexpr std::chrono::milliseconds kLinger{2};
// One for the next task, and one for the case that it takes long.
constexpr std::size_t kThreadsKept = 2;

thread_local const void* running_queue = nullptr;

}  // namespace

/// Its tasks are guarded by the pool's mutex. In `ready_` or being run exactly
/// while it has tasks, and held by the pool for as long.
class ElasticQueuePool::Queue final : public SerialQueue, public std::enable_shared_from_this<Queue> {
 public:
  explicit Queue(ElasticQueuePool& pool) : pool_(pool) {}

  void post(Task task) override { pool_.post(*this, std::move(task)); }
  void postAfter(std::chrono::nanoseconds delay, Task task) override {
    pool_.postAfter(*this, delay, std::move(task));
  }
  bool isCurrent() const override { return running_queue == this; }

 private:
  friend class ElasticQueuePool;

  ElasticQueuePool& pool_;
  std::vector<Task> tasks_;
  bool scheduled_ = false;
};

ElasticQueuePool::ElasticQueuePool(Bounds bounds) : bounds_(bounds) {
  const std::lock_guard lock(mutex_);
  addThread();
}

ElasticQueuePool::~ElasticQueuePool() { stop(); }

std::shared_ptr<SerialQueue> ElasticQueuePool::makeQueue(std::string_view) {
  return std::make_shared<Queue>(*this);
}

std::size_t ElasticQueuePool::threadCount() const {
  const std::lock_guard lock(mutex_);
  return threads_;
}

bool ElasticQueuePool::later(const Timer& a, const Timer& b) {
  return a.due != b.due ? a.due > b.due : a.number > b.number;
}

void ElasticQueuePool::post(Queue& queue, SerialQueue::Task task) {
  bool wake = false;
  bool bound_changed = false;
  {
    const std::lock_guard lock(mutex_);
    // Past the end the task dies with the argument, outside the lock.
    if (stopping_) return;
    const bool is_newly_ready = enqueue(queue, std::move(task));
    bound_changed = updateBound();
    wake = is_newly_ready && lingering_ == 0 && wake_ups_ < sleeping_;
    if (wake) ++wake_ups_;
  }
  if (wake) wake_.notify_one();
  if (bound_changed) announceBackLog();
}

// Under the mutex, as are the next ones. True when the queue had nothing to do.
bool ElasticQueuePool::enqueue(Queue& queue, SerialQueue::Task task) {
  queue.tasks_.push_back(std::move(task));
  ++waiting_tasks_;
  if (std::exchange(queue.scheduled_, true)) return false;
  ready_.push_back(queue.shared_from_this());
  return true;
}

void ElasticQueuePool::postAfter(Queue& queue, std::chrono::nanoseconds delay, SerialQueue::Task task) {
  if (delay <= std::chrono::nanoseconds::zero()) return post(queue, std::move(task));
  const TimePoint now = std::chrono::steady_clock::now();
  const TimePoint due = delay < TimePoint::max() - now ? now + delay : TimePoint::max();
  {
    const std::lock_guard lock(mutex_);
    if (stopping_) return;
    timers_.push_back({due, next_timer_number_++, queue.shared_from_this(), std::move(task)});
    std::push_heap(timers_.begin(), timers_.end(), later);
  }
  // Timers are rare: whoever sleeps looks at the clock anew.
  wake_.notify_all();
}

bool ElasticQueuePool::updateBound() {
  const bool before = over_bound_.load(std::memory_order_relaxed);
  const bool over = waiting_tasks_ > (before ? bounds_.most_waiting / 2 : bounds_.most_waiting);
  if (over == before) return false;
  over_bound_.store(over, std::memory_order_release);
  return true;
}

void ElasticQueuePool::announceBackLog() {
  const std::lock_guard lock(observer_mutex_);
  if (observer_) observer_();
}

void ElasticQueuePool::observeBackLog(BackLogObserver observer) {
  const std::lock_guard lock(observer_mutex_);
  observer_ = std::move(observer);
}

void ElasticQueuePool::addThread() {
  ++threads_;
  std::thread([this] {
    pthread_setname_np(pthread_self(), "queue-pool");
    run();
  }).detach();
}

void ElasticQueuePool::run() {
  Lock lock(mutex_);
  while (true) {
    takeDueTimers();
    if (!ready_.empty()) {
      runQueue(lock);
    } else if (stopping_ || !waitForWork(lock)) {
      break;
    }
  }
  --threads_;
  // Under the mutex: `stop` may return, and the pool be gone, right after.
  ended_.notify_all();
}

void ElasticQueuePool::runQueue(Lock& lock) {
  std::shared_ptr<Queue> queue = std::move(ready_.front());
  ready_.pop_front();
  // A task may take long: someone must be there for the other queues. Here rather
  // than in `post`, since making a thread takes its time.
  if (sleeping_ + lingering_ == 0 && threads_ < bounds_.most_threads) addThread();
  std::vector<SerialQueue::Task> turn = std::exchange(queue->tasks_, {});
  lock.unlock();
  running_queue = queue.get();
  for (SerialQueue::Task& task : turn) {
    task();
    task = nullptr;  // what it holds must not outlive its turn
  }
  running_queue = nullptr;
  lock.lock();
  waiting_tasks_ -= turn.size();
  queue->scheduled_ = !queue->tasks_.empty();
  if (queue->scheduled_) ready_.push_back(queue);
  const bool bound_changed = updateBound();
  lock.unlock();
  if (bound_changed) announceBackLog();
  queue.reset();  // may be the last that holds it, and must not die under the mutex
  lock.lock();
}

void ElasticQueuePool::takeDueTimers() {
  if (timers_.empty()) return;
  const TimePoint now = std::chrono::steady_clock::now();
  while (!timers_.empty() && timers_.front().due <= now) {
    std::pop_heap(timers_.begin(), timers_.end(), later);
    Timer timer = std::move(timers_.back());
    timers_.pop_back();
    enqueue(*timer.queue, std::move(timer.task));
  }
}

// False when the thread is not needed any more.
bool ElasticQueuePool::waitForWork(Lock& lock) {
  const auto hasWork = [this] { return !ready_.empty() || stopping_; };
  ++lingering_;
  wake_.wait_for(lock, kLinger, hasWork);
  --lingering_;
  if (hasWork()) return true;
  if (sleeping_ >= kThreadsKept) return false;
  ++sleeping_;
  const auto next_due = [this] { return timers_.empty() ? TimePoint::max() : timers_.front().due; };
  const TimePoint due = next_due();
  const auto woken = [&] { return wake_ups_ > 0 || stopping_ || next_due() != due; };
  if (due == TimePoint::max()) {
    wake_.wait(lock, woken);
  } else {
    wake_.wait_until(lock, due, woken);
  }
  --sleeping_;
  wake_ups_ = std::min(wake_ups_, sleeping_);
  return true;
}

void ElasticQueuePool::stop() {
  Lock lock(mutex_);
  stopping_ = true;
  wake_.notify_all();
  ended_.wait(lock, [this] { return threads_ == 0; });
  // Destroyed unlocked, since a task's destructor may post.
  const std::vector<Timer> not_due = std::exchange(timers_, {});
  lock.unlock();
}

}  // namespace tal
