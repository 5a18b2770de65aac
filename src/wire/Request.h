#pragma once

// What one frame from a client asked for.

#include <cstdint>
#include <optional>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"
#include "wire/WireProtocol.h"

namespace tal {

/// A request whose shape, types and ranges have all been checked. Which fields
/// bear something depends on the operation. One plain struct, used again for
/// request after request so that its vector keeps its memory.
struct Request {
  Operation operation = Operation::kHello;
  /// 0: no reply is wanted.
  std::uint64_t call = 0;

  /// hello: the replies to messages wait until the messages are stored.
  bool durable = false;

  /// The session that the operation is about; all but hello, sendMessage,
  /// getAllReporters and killService.
  ReporterID reporter_id = 0;
  AudioServiceType service_type = AudioServiceType::kUnknown;  ///< setServiceType
  std::optional<MessageDict> configuration;                    ///< setConfiguration

  // sendMessage
  MessageDict message;
  AudioEventCategory category = AudioEventCategory::kUnknown;
  AudioEventType type = AudioEventType::kUnknown;
  std::vector<ReporterID> reporter_ids;
};

/// Why a frame was refused. It has had no effect.
struct RequestError {
  WireErrorCode code = WireErrorCode::kBadRequest;
  /// The call that the reply bears, 0 where none could be read.
  std::uint64_t call = 0;
  /// False when the client asked for no reply to this call.
  bool wants_reply = true;
  /// A fixed text.
  const char* message = "";
};

}  // namespace tal
