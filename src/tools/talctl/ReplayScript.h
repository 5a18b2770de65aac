#pragma once

// The recorded scripts of `talctl replay`: one operation a line, in JSON. The
// format is told in docs/talctl.md.

#include <chrono>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "client/talreporting.hpp"

namespace tal::talctl {

/// One operation. What its kind has no use for is left as it is here.
struct ReplayStep {
  tal_operation operation;
  std::chrono::milliseconds pause_before{0};
  std::int64_t reporter = 0;
  std::uint16_t service_type = 0;
  std::uint32_t category = 0;
  std::uint16_t type = 0;
  std::vector<std::int64_t> reporters;     ///< Of a send; empty: a broadcast.
  std::optional<client::Message> message;  ///< Of a send; or a configuration, absent for null.
};

/// Nothing for a blank line and for a comment, which begins with "#". Throws
/// UsageError for a line that is no operation, or has keys that it has no use for.
std::optional<ReplayStep> parseReplayLine(std::string_view text);

/// The name that a script has for it, such as "create".
std::string_view replayOperationName(tal_operation operation);

}  // namespace tal::talctl
