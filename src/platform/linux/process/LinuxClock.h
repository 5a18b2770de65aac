#pragma once

#include "platform/Clock.h"

namespace tal {

/// The kernel's clocks; wall-clock and monotonic time are read without a system
/// call. Any thread.
class LinuxClock final : public Clock {
 public:
  double secondsSince1970() const override;
  Instant monotonic() const override;

  /// Uptime counts time spent in suspension. Costs a system call, for the
  /// processor time.
  TimeReading read() const override;

  std::string localTimeForFileName() const override;
  void sleepFor(std::chrono::nanoseconds duration) const override;

  /// Monotonic time as of the kernel's last tick (a few milliseconds): a quarter
  /// of the price, for those who ask per message whether it is time to look
  /// again at something.
  static Instant coarse();
};

}  // namespace tal
