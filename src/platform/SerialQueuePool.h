#pragma once

#include <memory>
#include <string_view>

#include "platform/SerialQueue.h"

namespace tal {

/// Makes private queues for work that must not run on the reporting queue. A
/// queue costs a few words of memory and no thread of its own, so that every
/// session may have one. Any thread.
class SerialQueuePool {
 public:
  virtual ~SerialQueuePool() = default;

  /// A queue with nothing in it; `label` names it where the host can show it. The
  /// pool outlives its queues, and holds one that has work or a timer: released
  /// by everyone else, it still runs what was posted.
  virtual std::shared_ptr<SerialQueue> makeQueue(std::string_view label) = 0;
};

}  // namespace tal
