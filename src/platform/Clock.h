#pragma once

#include <chrono>
#include <string>

#include "core/TimeReading.h"

namespace tal {

/// All time that the system knows. Any thread. A test drives its own.
class Clock {
 public:
  using Instant = std::chrono::nanoseconds;  ///< Since an arbitrary start; never goes back.

  virtual ~Clock() = default;

  /// Wall-clock time; may jump. Read once per message: must be cheap.
  virtual double secondsSince1970() const = 0;
  virtual Instant monotonic() const = 0;
  /// All clocks that derived messages are stamped with.
  virtual TimeReading read() const = 0;
  /// The local time as file names bear it: "20240131-154502+0100".
  virtual std::string localTimeForFileName() const = 0;
  /// Holds the calling thread for so long, and with it the queue that it serves.
  virtual void sleepFor(std::chrono::nanoseconds duration) const = 0;
};

}  // namespace tal
