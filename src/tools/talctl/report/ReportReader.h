#pragma once

// Reads a store for a report: all of it, since events are found by name and the store has no index of names.
// Such an index would cost the daemon more at every event than it saves here once in a while.

#include <cstdint>
#include <filesystem>
#include <optional>

#include "tools/talctl/report/ReportTally.h"

namespace tal::talctl {

struct StoreReading {
  ReportTally tally;
  std::uint64_t events = 0;  ///< All that were recorded in the time, of whatever name.
  /// Seconds since 1970; nothing without events.
  std::optional<double> first_at;
  std::optional<double> last_at;
};

/// Adds up the events recorded at `since` (seconds since 1970) or later, on as many threads as there are
/// processors. A message is stored under two names; the one of its service is read, and the general one of
/// each kind of which the store has no other. `path` must exist. Throws CommandFailure when it cannot be
/// read.
StoreReading readStore(const std::filesystem::path& path, std::optional<double> since);

}  // namespace tal::talctl
