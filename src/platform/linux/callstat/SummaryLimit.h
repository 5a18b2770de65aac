#pragma once

// A session's summary joins all values of each key, which a long session makes
// longer than anybody downstream takes.

#include <cstddef>
#include <cstdint>

#include "core/MessageDict.h"

namespace tal {

/// What a key of a summary may hold.
inline constexpr std::size_t kMostSummaryValueBytes = std::size_t{64} * 1024;

struct LimitedSummary {
  MessageDict summary;
  std::size_t cut_keys = 0;
};

/// The summary with every longer text cut to the whole values that fit (a single
/// value that does not fit is cut between two characters). What was left out is
/// told under "TAL_Session_Summary_LeftOut": {key: number of bytes}.
LimitedSummary limitSummary(const MessageDict& summary);

}  // namespace tal
