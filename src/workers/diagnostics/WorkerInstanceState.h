#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>

#include "core/MessageDict.h"
#include "platform/Clock.h"
#include "platform/SymptomReporterService.h"

namespace tal {

/// How far one bug-capture instance has counted. Lives on the reporting queue.
struct WorkerInstanceState {
  static constexpr std::uint64_t kNever = std::numeric_limits<std::uint64_t>::max();

  /// Once the state has fired, it never fires again.
  bool oncePerSession = false;
  /// What the service called the last capture, or "NONE_RETURNED".
  std::optional<std::string> currentHoundSessionIdentifier;
  /// Interesting messages since the last fire.
  std::uint64_t interestedCount = 0;
  /// The count at which firing becomes possible.
  std::uint64_t interestThresholdCount = kNever;
  /// When the first of them was seen: on the clock that nobody sets, since only
  /// spans of time are asked of it.
  std::optional<Clock::Instant> interestFirstSeen;
  /// Counts only where `interestThresholdCount` is 0.
  double interestThresholdDurationSeconds = std::numeric_limits<double>::max();
  std::uint64_t firedCount = 0;
  /// The payload counted last, while there was no fire since.
  std::optional<MessageDict> lastMessage;
  /// The service's client for the current fire.
  std::shared_ptr<SymptomReporterService> symptomReporter;
};

}  // namespace tal
