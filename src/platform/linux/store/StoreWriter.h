#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <mutex>
#include <thread>

#include "platform/linux/store/RowQueue.h"
#include "platform/linux/store/StoreCommitter.h"

namespace tal {

/// The store `<directory>/store.db` and the one thread that writes it.
///
/// Rows are numbered from 1 as they are appended, and committed together in that
/// order: at once when somebody waits for them (`requestCommit`), else at most
/// 50 ms after the first of them came. A row is settled when it is committed or
/// given up; a committed row survives kill -9. While no row waits the thread
/// does not wake up.
///
/// A disk that fails: rows wait in bounded memory (64 MiB), the commit is tried
/// again with growing pauses, and past the bound the oldest are given up. Their
/// number is logged, and stored as the event `kRowsGivenUpEvent` once the disk is
/// back. A disk that is merely slow: `overBound` makes the producers' clients wait.
///
/// 1. The constructor opens the store and starts the thread.
/// 2. Observers are set, and rows appended.
/// 3. `flushAndClose` (the destructor calls it) commits everything, closes the
///    file and ends the thread; rows appended after that are given up.
///
/// Any thread, except where a method says otherwise.
class StoreWriter {
 public:
  /// `directory` exists; what is referred to outlives the object.
  using Dependencies = StoreCommitter::Dependencies;

  /// The name of the event that tells how many rows were given up: payload
  /// {"rows": integer, "since": date, "until": date}.
  static constexpr std::string_view kRowsGivenUpEvent = "org.vantle.talsys.store.RowsGivenUp";

  /// Told on the writer thread that all rows up to this number are settled.
  using ProgressObserver = std::function<void(std::uint64_t settled_through)>;
  /// Told on any thread that the answer of `overBound` may have changed; calls
  /// can come in either order, so the answer must be asked for.
  using BackLogObserver = std::function<void()>;

  /// Throws StartupError when the store cannot be opened; a file that is refused
  /// is left as it is.
  explicit StoreWriter(Dependencies dependencies, RowQueue::Bounds bounds = {});
  StoreWriter(const StoreWriter&) = delete;
  StoreWriter& operator=(const StoreWriter&) = delete;
  ~StoreWriter();

  /// Copies the row and returns its number. Never waits for the disk.
  std::uint64_t append(const StoreRow& row);

  /// The number of the row that was appended last. Read before and after a piece
  /// of work it tells which rows that work caused, provided that one thread appends.
  std::uint64_t sequence() const { return sequence_.load(std::memory_order_acquire); }

  /// Has the rows up to this number committed without delay.
  void requestCommit(std::uint64_t through);

  /// All rows up to this one are settled. Who waits for a row registers first
  /// and asks this afterwards, so that no progress is missed.
  std::uint64_t settledThrough() const { return settled_.load(std::memory_order_acquire); }

  /// True when one of these settled rows is not in the store.
  bool wasGivenUp(RowRange rows) const;

  /// Replaces the observer (empty: none). When this returns, the old one is not
  /// running and will not be called again; so not from within an observer.
  void observeProgress(ProgressObserver observer);
  void observeBackLog(BackLogObserver observer);

  /// True while more rows wait than a sound disk writes in a moment: no more
  /// should be read from clients. False while the disk fails, since waiting for
  /// it would stop the service.
  bool overBound() const { return over_bound_.load(std::memory_order_acquire); }

  /// Waits until all rows appended before are settled, at most this long; a disk
  /// that fails is tried at once. False when time ran out. Not on the writer thread.
  bool commitNow(std::chrono::nanoseconds at_most);

  /// Commits what waits (a failing disk is tried a few times, then the rest is
  /// given up) and closes the file. Not on the writer thread.
  void flushAndClose();

 private:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Lock = std::unique_lock<std::mutex>;
  // What the writer thread sleeps for; it is woken for nothing else.
  enum class SleepsFor { kNothing, kRows, kMoreRows, kTheDisk };

  void run();
  bool hasWork() const;
  bool commitIsDue() const;
  void commitBatch(Lock& lock);
  void afterFailure(Lock& lock);
  void sleepUntilWoken(Lock& lock);
  void settle(Lock& lock);
  std::uint64_t refuse();
  void noteGivenUp(std::uint64_t count_before);
  bool updateBound();
  void announceBackLog();
  bool takeWakeUp(std::initializer_list<SleepsFor> reasons);

  const Clock& clock_;
  const LogChannel& log_;
  StoreCommitter committer_;  // the writer thread's alone

  mutable std::mutex mutex_;
  std::condition_variable wake_;
  std::condition_variable settled_changed_;
  RowQueue rows_;
  GivenUpRows given_up_;
  SleepsFor sleeps_for_ = SleepsFor::kNothing;
  TimePoint first_waits_since_;
  std::uint64_t wanted_through_ = 0;
  bool retry_at_once_ = false;
  bool failing_ = false;
  bool closing_ = false;
  unsigned failures_while_closing_ = 0;
  bool closed_ = false;
  bool refused_any_ = false;

  std::atomic<std::uint64_t> sequence_{0};
  std::atomic<std::uint64_t> settled_{0};
  std::atomic<bool> over_bound_{false};

  // One each: a progress observer that takes its time must not hold up a producer.
  std::mutex progress_observer_mutex_;
  ProgressObserver progress_observer_;
  std::mutex back_log_observer_mutex_;
  BackLogObserver back_log_observer_;

  std::thread thread_;  // last: uses all of the above
};

}  // namespace tal
