#pragma once

#include <cstdint>
#include <string_view>

#include "core/MessageDict.h"

namespace tal {

/// The power-accounting log, which attributes energy use to applications. Called
/// on the reporting queue: must be cheap and must not block. Nobody learns of an
/// event that could not be logged.
class EnergylogSink {
 public:
  virtual ~EnergylogSink() = default;

  /// Logs an event of a name that is registered with the log. Events keep their order.
  virtual void logRegisteredEvent(std::int32_t event_class, std::string_view name,
                                  const MessageDict& payload) = 0;
};

}  // namespace tal
