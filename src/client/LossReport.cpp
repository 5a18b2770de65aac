// When and what to tell the daemon of messages that were lost.
#include "client/LossReport.h"

namespace tal::clientlib {

std::optional<LossReport::TimePoint> LossReport::due(const Counters& counters) const {
  if (underWay_ || unreported(counters).all() == 0) return std::nullopt;
  return next_;
}

LossReport::Losses LossReport::begin(const Counters& counters, TimePoint now) {
  underWay_ = unreported(counters);
  next_ = now + kBetweenReports;
  return *underWay_;
}

void LossReport::answered() {
  if (!underWay_) return;
  reported_.queueFull += underWay_->queueFull;
  reported_.tooLarge += underWay_->tooLarge;
  reported_.invalid += underWay_->invalid;
  reported_.refused += underWay_->refused;
  underWay_.reset();
}

void LossReport::connectionBroke() {
  underWay_.reset();
  next_ = {};
}

LossReport::Losses LossReport::unreported(const Counters& counters) const {
  const auto since = [](const std::atomic<std::uint64_t>& counter, std::uint64_t before) {
    return counter.load(std::memory_order_relaxed) - before;
  };
  return {since(counters.droppedQueueFull, reported_.queueFull),
          since(counters.droppedTooLarge, reported_.tooLarge),
          since(counters.droppedInvalid, reported_.invalid), since(counters.refused, reported_.refused)};
}

}  // namespace tal::clientlib
