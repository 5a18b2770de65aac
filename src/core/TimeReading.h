#pragma once

// The clocks that are stamped into messages, read together.

#include <cstdint>

namespace tal {

struct TimeReading {
  double seconds_since_1970 = 0;
  double uptime_seconds = 0;
  /// Processor time that this process has consumed, in ticks of one microsecond.
  std::int64_t processor_ticks = 0;
};

}  // namespace tal
