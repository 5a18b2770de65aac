#include "platform/linux/store/Retention.h"

#include <algorithm>

namespace tal {

namespace {

constexpr std::int64_t kMostRowsPerSlice = 250;
// A page or two would soon be exceeded again, one row at a time.
constexpr std::int64_t kLeastBytesPerSlice = 64 * 1024;
// The log's share of a small bound, so that rows keep most of it.
constexpr std::int64_t kMostLogShare = 4;
// Free pages are soon used again; only a good part of the file is worth moving
// pages for.
constexpr std::int64_t kLeastFreeShare = 8;
constexpr std::int64_t kLeastFreeBytes = 4 * 1024 * 1024;

// Rows that stand for so many bytes if they are like the others.
std::int64_t rowsFor(std::int64_t bytes, const RetentionState& state) {
  std::int64_t rows = 0;
  for (const TableSpan& span : state.tables) rows += span.last_id - span.first_id + 1;
  const std::int64_t bytes_per_row =
      std::max<std::int64_t>(state.used_bytes / std::max<std::int64_t>(rows, 1), 1);
  return std::clamp<std::int64_t>(bytes / bytes_per_row, 1, kMostRowsPerSlice);
}

}  // namespace

RetentionStep nextRetentionStep(const RetentionState& state, const RetentionLimits& limits) {
  if (!state.tables.empty()) {
    const TableSpan& oldest = *std::min_element(
        state.tables.begin(), state.tables.end(),
        [](const TableSpan& a, const TableSpan& b) { return a.first_recorded_at < b.first_recorded_at; });
    const double too_old = state.now - static_cast<double>(limits.most_age.count());
    if (oldest.first_recorded_at < too_old) {
      return {.action = RetentionStep::Action::kDelete,
              .table = oldest.table,
              .through_id = oldest.first_id + kMostRowsPerSlice - 1,
              .recorded_before = too_old};
    }
    const std::int64_t for_rows =
        limits.most_bytes - std::min(state.log_bytes, limits.most_bytes / kMostLogShare);
    if (state.used_bytes > for_rows) {
      return {.action = RetentionStep::Action::kDelete,
              .table = oldest.table,
              .through_id = oldest.first_id +
                            rowsFor(std::max(state.used_bytes - for_rows, kLeastBytesPerSlice), state) - 1,
              .recorded_before = {}};
    }
  }
  if (state.free_bytes > std::max(kLeastFreeBytes, (state.used_bytes + state.free_bytes) / kLeastFreeShare)) {
    return {.action = RetentionStep::Action::kShrink, .table = {}, .through_id = 0, .recorded_before = {}};
  }
  return {};
}

}  // namespace tal
