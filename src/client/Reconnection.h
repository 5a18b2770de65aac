// How long to wait before the next attempt to connect: deciding only, no clock and no thread.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>

namespace tal::clientlib {

/// Pauses that double from `first` to `longest`. Each is shortened by a random part of up to one half, so
/// that the clients of a daemon that comes back do not all arrive at once.
class Reconnection {
 public:
  using Duration = std::chrono::microseconds;

  Reconnection(std::chrono::milliseconds first, std::chrono::milliseconds longest)
      : first_(first), longest_(longest) {}

  /// The pause after a failed attempt or a connection that broke. `random` is in [0, 1).
  Duration nextPause(double random) {
    Duration full = longest_;
    // The shift is bounded: past it every pause is the longest one.
    if (failures_ < kMaxDoublings) full = std::min(longest_, first_ * (std::int64_t{1} << failures_));
    ++failures_;
    return Duration(static_cast<std::int64_t>(static_cast<double>(full.count()) * (1.0 - random / 2)));
  }

  /// A connection that lasted `lifetime` has ended. One that broke at once counts as a failed attempt, lest a
  /// daemon that dies of every connection be met by a busy loop.
  void connectionEnded(Duration lifetime) {
    if (lifetime >= kStableAfter * first_) failures_ = 0;
  }

 private:
  static constexpr unsigned kMaxDoublings = 30;
  static constexpr int kStableAfter = 10;

  Duration first_;
  Duration longest_;
  unsigned failures_ = 0;
};

}  // namespace tal::clientlib
