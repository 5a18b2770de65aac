#include "platform/linux/store/StoreWriter.h"

#include <pthread.h>

#include <algorithm>
#include <utility>

namespace tal {

namespace {

using std::chrono_literals::operator""ms;

// What a kill -9 can cost where nobody asked for durability.
constexpr std::chrono::milliseconds kLongestWait = 50ms;
// A batch of this size is worth a commit before its time is up, and still lies
// in the processor's cache.
constexpr std::size_t kPromptBytes = std::size_t{1} * 1024 * 1024;
// One transaction: bounds what a durable reply waits behind.
constexpr std::size_t kBatchBytes = std::size_t{4} * 1024 * 1024;
// A sound disk writes this in a tenth of a second.
constexpr std::size_t kOverBoundBytes = std::size_t{16} * 1024 * 1024;
constexpr std::size_t kUnderBoundBytes = kOverBoundBytes / 2;
// At the end a failing disk is tried so often; the caller waits.
constexpr unsigned kMostFailuresWhileClosing = 3;
constexpr std::chrono::milliseconds kPauseWhileClosing = 100ms;

}  // namespace

StoreWriter::StoreWriter(Dependencies dependencies, RowQueue::Bounds bounds)
    : clock_(dependencies.clock), log_(dependencies.log), committer_(std::move(dependencies)), rows_(bounds) {
  thread_ = std::thread([this] {
    pthread_setname_np(pthread_self(), "store-writer");
    run();
  });
}

StoreWriter::~StoreWriter() { flushAndClose(); }

std::uint64_t StoreWriter::append(const StoreRow& row) {
  bool wake = false;
  bool bound_changed = false;
  std::uint64_t sequence = 0;
  {
    const std::lock_guard lock(mutex_);
    if (closing_) return refuse();
    const bool was_empty = !rows_.hasWaiting();
    const std::uint64_t given_up_before = rows_.givenUpCount();
    sequence = rows_.append(row);
    sequence_.store(sequence, std::memory_order_release);
    if (was_empty) {
      first_waits_since_ = std::chrono::steady_clock::now();
      wake = takeWakeUp({SleepsFor::kRows});
    }
    if (rows_.givenUpCount() != given_up_before) {
      noteGivenUp(given_up_before);
      wake |= takeWakeUp({SleepsFor::kRows, SleepsFor::kMoreRows, SleepsFor::kTheDisk});
    }
    if (rows_.bytes() >= kPromptBytes) wake |= takeWakeUp({SleepsFor::kMoreRows});
    bound_changed = updateBound();
  }
  if (wake) wake_.notify_one();
  if (bound_changed) announceBackLog();
  return sequence;
}

// Under the mutex. Were rows still taken, a flood could keep the end away.
std::uint64_t StoreWriter::refuse() {
  const std::uint64_t sequence = rows_.refuse();
  sequence_.store(sequence, std::memory_order_release);
  if (closed_) settled_.store(rows_.settledThrough(), std::memory_order_release);
  if (!std::exchange(refused_any_, true)) {
    TAL_LOG_ERROR(log_, "rows that come after the end of the store are not kept");
  }
  return sequence;
}

// True when the writer thread must be woken. One of the reasons being met, it
// is woken once, whatever else comes before it runs.
bool StoreWriter::takeWakeUp(std::initializer_list<SleepsFor> reasons) {
  if (std::find(reasons.begin(), reasons.end(), sleeps_for_) == reasons.end()) return false;
  sleeps_for_ = SleepsFor::kNothing;
  return true;
}

void StoreWriter::noteGivenUp(std::uint64_t count_before) {
  const double now = clock_.secondsSince1970();
  if (given_up_.rows == 0) given_up_.since = now;
  given_up_.rows += rows_.givenUpCount() - count_before;
  given_up_.until = now;
}

void StoreWriter::requestCommit(std::uint64_t through) {
  bool wake = false;
  {
    const std::lock_guard lock(mutex_);
    wanted_through_ = std::max(wanted_through_, through);
    if (wanted_through_ > rows_.settledThrough()) wake = takeWakeUp({SleepsFor::kMoreRows});
  }
  if (wake) wake_.notify_one();
}

bool StoreWriter::wasGivenUp(RowRange rows) const {
  const std::lock_guard lock(mutex_);
  return rows_.wasGivenUp(rows);
}

void StoreWriter::observeProgress(ProgressObserver observer) {
  const std::lock_guard lock(progress_observer_mutex_);
  progress_observer_ = std::move(observer);
}

void StoreWriter::observeBackLog(BackLogObserver observer) {
  const std::lock_guard lock(back_log_observer_mutex_);
  back_log_observer_ = std::move(observer);
}

void StoreWriter::announceBackLog() {
  const std::lock_guard lock(back_log_observer_mutex_);
  if (back_log_observer_) back_log_observer_();
}

bool StoreWriter::updateBound() {
  const bool before = over_bound_.load(std::memory_order_relaxed);
  const bool over = !failing_ && rows_.bytes() > (before ? kUnderBoundBytes : kOverBoundBytes);
  if (over == before) return false;
  over_bound_.store(over, std::memory_order_release);
  return true;
}

bool StoreWriter::commitNow(std::chrono::nanoseconds at_most) {
  Lock lock(mutex_);
  const std::uint64_t through = rows_.lastSequence();
  wanted_through_ = std::max(wanted_through_, through);
  retry_at_once_ = true;
  sleeps_for_ = SleepsFor::kNothing;
  wake_.notify_one();
  settled_changed_.wait_for(lock, at_most, [&] { return settledThrough() >= through || closed_; });
  return settledThrough() >= through;
}

void StoreWriter::flushAndClose() {
  {
    const std::lock_guard lock(mutex_);
    closing_ = true;
    retry_at_once_ = true;
    sleeps_for_ = SleepsFor::kNothing;
  }
  wake_.notify_one();
  if (thread_.joinable()) thread_.join();
}

void StoreWriter::run() {
  Lock lock(mutex_);
  while (hasWork() || !closing_) {
    settle(lock);
    if (committer_.maintenanceIsDue()) {
      lock.unlock();
      committer_.maintainForAMoment();
      lock.lock();
    }
    if (hasWork() && commitIsDue()) {
      commitBatch(lock);
    } else if (!closing_ && !committer_.maintenanceIsDue()) {
      sleepUntilWoken(lock);
    }
  }
  settle(lock);
  lock.unlock();
  committer_.close();
  lock.lock();
  closed_ = true;
  settled_.store(rows_.settledThrough(), std::memory_order_release);
  settled_changed_.notify_all();
}

// A report on rows that were given up goes with the next rows, or the end.
bool StoreWriter::hasWork() const { return rows_.hasWaiting() || (closing_ && given_up_.rows > 0); }

bool StoreWriter::commitIsDue() const {
  return closing_ || wanted_through_ > rows_.settledThrough() || rows_.bytes() >= kPromptBytes ||
         std::chrono::steady_clock::now() >= first_waits_since_ + kLongestWait;
}

void StoreWriter::sleepUntilWoken(Lock& lock) {
  if (rows_.settledThrough() != settledThrough()) return;
  if (rows_.hasWaiting()) {
    sleeps_for_ = SleepsFor::kMoreRows;
    const TimePoint due = first_waits_since_ + kLongestWait;
    wake_.wait_until(lock, due);
  } else {
    sleeps_for_ = SleepsFor::kRows;
    wake_.wait(lock);
  }
  sleeps_for_ = SleepsFor::kNothing;
}

void StoreWriter::commitBatch(Lock& lock) {
  retry_at_once_ = false;
  std::vector<RowChunk> batch = rows_.take(kBatchBytes);
  const GivenUpRows told = given_up_;
  lock.unlock();
  const bool committed = committer_.commit(batch, told);
  lock.lock();
  failing_ = !committed;
  if (committed) {
    rows_.finish(std::move(batch));
    given_up_.rows -= told.rows;
    given_up_.since = told.until;
  } else {
    rows_.putBack(std::move(batch));
  }
  if (updateBound()) {
    lock.unlock();
    announceBackLog();
    lock.lock();
  }
  settle(lock);
  if (!committed) afterFailure(lock);
}

void StoreWriter::afterFailure(Lock& lock) {
  if (closing_ && ++failures_while_closing_ >= kMostFailuresWhileClosing) {
    const std::uint64_t before = rows_.givenUpCount();
    rows_.giveUpAll();
    noteGivenUp(before);
    TAL_LOG_ERROR(log_, given_up_.rows, " rows are given up: the store cannot be written at the end");
    given_up_ = {};
    return;
  }
  const auto pause = closing_ ? kPauseWhileClosing : committer_.pauseBeforeRetry();
  const TimePoint end = std::chrono::steady_clock::now() + pause;
  while (!retry_at_once_ && std::chrono::steady_clock::now() < end) {
    sleeps_for_ = SleepsFor::kTheDisk;
    wake_.wait_until(lock, end);
    sleeps_for_ = SleepsFor::kNothing;
    settle(lock);  // rows given up meanwhile
  }
}

// Tells those who wait what has been settled since the last time.
void StoreWriter::settle(Lock& lock) {
  const std::uint64_t settled = rows_.settledThrough();
  if (settled == settledThrough()) return;
  settled_.store(settled, std::memory_order_release);
  settled_changed_.notify_all();
  lock.unlock();
  {
    const std::lock_guard observers(progress_observer_mutex_);
    if (progress_observer_) progress_observer_(settled);
  }
  lock.lock();
}

}  // namespace tal
