// When and what to tell the daemon of messages that were lost.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

#include "client/Outbox.h"

namespace tal::clientlib {

/// Decides only; whoever asks sends the message. Lives on the library's thread.
class LossReport {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  struct Losses {
    std::uint64_t queueFull = 0;
    std::uint64_t tooLarge = 0;
    std::uint64_t invalid = 0;
    std::uint64_t refused = 0;
    std::uint64_t all() const { return queueFull + tooLarge + invalid + refused; }
  };

  /// When there will be something to send; nothing while nothing was lost or a report is under way.
  std::optional<TimePoint> due(const Counters& counters) const;
  /// What to send now; it is taken for reported once answered() says so.
  Losses begin(const Counters& counters, TimePoint now);
  void answered();
  /// The connection broke: what was not answered is reported again, as soon as there is a new one.
  void connectionBroke();

 private:
  /// While losses go on, a report of each would add to the load that causes them.
  static constexpr std::chrono::seconds kBetweenReports{10};

  Losses unreported(const Counters& counters) const;

  Losses reported_;
  std::optional<Losses> underWay_;
  TimePoint next_{};
};

}  // namespace tal::clientlib
