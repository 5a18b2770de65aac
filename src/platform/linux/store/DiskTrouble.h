#pragma once

// How a failing disk is met, as pure functions of what happened and when.

#include <algorithm>
#include <chrono>
#include <optional>

namespace tal {

/// The pause before the next attempt after `failures` attempts in a row that
/// failed: short at first, as most trouble passes, then longer.
inline std::chrono::milliseconds retryPause(unsigned failures) {
  constexpr std::chrono::milliseconds kFirst{100};
  constexpr std::chrono::milliseconds kLongest{5000};
  constexpr unsigned kMostDoublings = 6;
  if (failures == 0) return std::chrono::milliseconds::zero();
  return std::min(kLongest, kFirst * (1U << std::min(failures - 1, kMostDoublings)));
}

/// Lets one line through per minute.
class OncePerMinute {
 public:
  bool allows(std::chrono::nanoseconds now) {
    if (last_ && now - *last_ < std::chrono::minutes(1)) return false;
    last_ = now;
    return true;
  }

 private:
  std::optional<std::chrono::nanoseconds> last_;
};

}  // namespace tal
