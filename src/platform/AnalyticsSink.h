#pragma once

#include <functional>
#include <string_view>

#include "core/MessageDict.h"

namespace tal {

/// Where analytics events go.
///
/// Called on the reporting queue, for every message: both operations must be
/// cheap and must not block. Events of one thread keep their order. An event
/// can still be lost until the sink has made it durable; when that is, the
/// implementation says.
class AnalyticsSink {
 public:
  using PayloadProvider = std::function<MessageDict()>;

  virtual ~AnalyticsSink() = default;

  /// True when someone consumes events of this name. Asked twice per message.
  virtual bool eventIsWanted(std::string_view name) = 0;

  /// Queues one event. `provider` is called at most once, only if the event is
  /// really recorded, and before this returns: the message that it reads may
  /// be extended by a worker later on.
  virtual void sendEventWithPayloadProvider(std::string_view name, const PayloadProvider& provider) = 0;
};

}  // namespace tal
