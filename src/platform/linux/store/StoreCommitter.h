#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <vector>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/SettingsStore.h"
#include "platform/linux/store/DiskTrouble.h"
#include "platform/linux/store/RowChunk.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreSettings.h"

namespace tal {

/// Rows that were given up and that the store does not tell of yet.
struct GivenUpRows {
  std::uint64_t rows = 0;
  double since = 0;  ///< Seconds since 1970, as is the next.
  double until = 0;
};

/// What the writer thread does with the store's file: commits, retention, and
/// what follows when the disk fails. One thread at a time.
class StoreCommitter {
 public:
  struct Dependencies {
    std::filesystem::path directory;
    const SettingsStore& settings;
    const Clock& clock;
    const LogChannel& log;
  };

  /// Opens the store. Throws StartupError.
  explicit StoreCommitter(Dependencies dependencies);

  /// Commits the rows, and an event that tells of those given up, all or none.
  /// False when the disk refused; that is logged, once per minute.
  bool commit(const std::vector<RowChunk>& batch, const GivenUpRows& given_up);

  /// What to wait after the failures so far before the next commit.
  std::chrono::milliseconds pauseBeforeRetry() const { return retryPause(failures_); }

  /// True when retention has work, or it is time to see whether it has.
  bool maintenanceIsDue() const;
  /// A few milliseconds of it. Also takes up changed settings.
  void maintainForAMoment();

  /// Moves the log into the file and closes it.
  void close();

 private:
  void insertReport(const GivenUpRows& given_up);
  void carryOutSteps();
  void tellOfOutboxLosses();
  void noteFailure(const StoreError& error);
  void noteSuccess(const GivenUpRows& given_up);

  Dependencies dependencies_;
  std::filesystem::path path_;
  StoreSettingsReader settings_reader_;
  StoreSettings settings_;
  std::unique_ptr<StoreDatabase> database_;  // none after a lasting failure
  unsigned failures_ = 0;
  OncePerMinute failure_lines_;
  std::int64_t outbox_losses_ = 0;  // not told yet
  OncePerMinute outbox_lines_;
  Clock::Instant maintained_at_{};
  std::size_t bytes_since_maintenance_ = 0;
  bool maintenance_unfinished_ = true;
};

}  // namespace tal
