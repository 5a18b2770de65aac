// A moment on both clocks: messages say when something happened by the calendar, durations
// must not jump when the calendar is set.
#pragma once

#include <chrono>

namespace tal {

struct Instant {
  std::chrono::system_clock::time_point wall;
  std::chrono::steady_clock::time_point steady;

  static Instant now() { return {std::chrono::system_clock::now(), std::chrono::steady_clock::now()}; }

  /// The moment that the steady clock showed `then`.
  Instant at(std::chrono::steady_clock::time_point then) const {
    return {wall - std::chrono::duration_cast<std::chrono::system_clock::duration>(steady - then), then};
  }

  /// Seconds since 1970, as messages carry it.
  double epochSeconds() const { return std::chrono::duration<double>(wall.time_since_epoch()).count(); }
};

}  // namespace tal
