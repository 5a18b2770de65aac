#pragma once

// What the workers that derive summaries share: the folding of bursts of related
// messages into one.

#include <span>
#include <vector>

#include "core/MessageKey.h"
#include "core/TalReportingSessionMessage.h"

namespace tal {

/// Stateless operations. Lives on the reporting queue.
class TalReportingSessionWorkerUtility {
 public:
  using Messages = std::vector<TalReportingSessionMessage::Pointer>;

  /// Folds bursts: a client that changes several related settings sends a message
  /// for each, which a reader of the summaries wants to see as one change.
  ///
  /// A burst gathers at most one message per key of `keys`, each less than
  /// `maximum_pause_seconds` after the one merged before it. The result holds the
  /// given records themselves, in their order; the first record of a burst is
  /// extended in place by those that are merged into it, so that whoever reads it
  /// later sees the whole burst. A message without any of the keys neither joins
  /// nor ends a burst. One that comes too late stands alone but deliberately
  /// begins no burst of its own.
  static Messages combineRapidMessages(const Messages& messages, std::span<const MessageKey> keys,
                                       double maximum_pause_seconds);

  /// True when a key begins with "vmox_invalid_".
  static bool isParleyXYerrorMessage(const TalReportingSessionMessage& message);
};

}  // namespace tal
