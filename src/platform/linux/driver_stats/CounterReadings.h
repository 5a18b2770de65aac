#pragma once

// Counters that came as plain text, of a driver's file or of the kernel's: one
// number, times spent in states, hits of a histogram's buckets.

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/DriverStatsFeed.h"

namespace tal {

struct SimpleReading {
  std::uint64_t value = 0;
  std::uint64_t largest = 0;  ///< after which the counter starts from 0
};

struct StateReading {
  struct State {
    std::string name;
    std::uint64_t transitions = 0;
    std::uint64_t residency = 0;
  };
  std::vector<State> states = {};
  std::uint64_t largest = 0;
};

struct HistogramReading {
  struct Bucket {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    std::uint64_t hits = 0;
  };
  std::vector<Bucket> buckets = {};
  /// Of all values ever seen, where the driver tells.
  std::optional<std::int64_t> minimum = {};
  std::optional<std::int64_t> maximum = {};
  std::uint64_t largest = 0;
};

// Text of another form gives nothing. Counters have `bits` bits, 1 to 64, and more
// than they hold is another form too. Empty lines and those that begin with "#" are
// passed over.

/// One number.
std::optional<SimpleReading> parseSimple(std::string_view text, unsigned bits);
/// A line for each state: name, times entered, time spent.
std::optional<StateReading> parseStates(std::string_view text, unsigned bits);
/// A line for each bucket: lower bound, upper bound, hits; and, if known, "min" and
/// "max" with a number each.
std::optional<HistogramReading> parseHistogram(std::string_view text, unsigned bits);

// Put the difference into the channel. Counters that were set back in between
// count from 0.

void fillDelta(const SimpleReading& before, const SimpleReading& after, DriverStatsChannel& channel);
/// States are told apart by name; one that is new counts from 0.
void fillDelta(const StateReading& before, const StateReading& after, DriverStatsChannel& channel);
/// Buckets are told apart by their bounds. Without a minimum and maximum of the
/// driver's, they are the outer bounds of the buckets that were hit.
void fillDelta(const HistogramReading& before, const HistogramReading& after, DriverStatsChannel& channel);

}  // namespace tal
