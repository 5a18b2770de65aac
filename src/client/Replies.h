// Replies of the daemon, decoded.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "client/talreporting.h"

namespace tal::clientlib {

/// One reply, whatever it answers: which of the results holds, the call tells.
struct Reply {
  enum class Result { Null, Number, Reporters, Map };

  std::uint64_t call = 0;
  bool failed = false;
  /// Holds where `failed`.
  tal_error error{};
  Result result = Result::Null;
  /// A boolean or an unsigned number.
  std::uint64_t number = 0;
  std::vector<std::int64_t> reporters;
  /// Entries of a map; unknown ones are passed over.
  std::int64_t reporterId = 0;
  std::uint64_t serviceType = TAL_SERVICE_UNKNOWN;
  std::uint64_t version = 0;
  std::string server;
};

/// Decodes the content of one frame into `reply`, whose memory is used again. False where it is no reply.
bool decodeReply(std::span<const unsigned char> frame, Reply& reply);

}  // namespace tal::clientlib
