#pragma once

// What to delete next, as a pure decision: no clock, no disk.

#include <chrono>
#include <cstdint>
#include <optional>
#include <span>

#include "platform/linux/store/StoreRow.h"

namespace tal {

struct RetentionLimits {
  std::chrono::seconds most_age{};
  std::int64_t most_bytes = 0;  ///< All tables together, and the log of the file beside them.
};

/// A table that holds rows.
struct TableSpan {
  StoreTable table = StoreTable::kEvents;
  std::int64_t first_id = 0;
  std::int64_t last_id = 0;
  double first_recorded_at = 0;
};

struct RetentionState {
  double now = 0;               ///< Seconds since 1970.
  std::int64_t used_bytes = 0;  ///< Pages that hold something.
  std::int64_t free_bytes = 0;  ///< Pages of the file that hold nothing.
  std::int64_t log_bytes = 0;   ///< What the log beside the file may take.
  std::span<const TableSpan> tables;
};

struct RetentionStep {
  enum class Action {
    kNothing,
    kDelete,  ///< Rows of `table` up to `through_id`, those recorded before `recorded_before` only.
    kShrink,  ///< Hand a slice of the free pages back to the file system.
  };
  Action action = Action::kNothing;
  StoreTable table = StoreTable::kEvents;
  std::int64_t through_id = 0;
  std::optional<double> recorded_before;
};

/// The next slice of work, small enough not to hold rows up; asked again until
/// it says nothing. Rows that are too old go first; then, while the store is
/// over its size, the oldest rows of all tables. Each step deletes a row at least.
RetentionStep nextRetentionStep(const RetentionState& state, const RetentionLimits& limits);

}  // namespace tal
