#pragma once

#include <cstdint>

#include "core/ProtobufMessage.h"

namespace tal {

/// The wireless-diagnostics metric service. Called on the reporting queue: must be
/// cheap and must not block. Nobody learns of a record that could not be posted.
class PlumeMetricSubmitter {
 public:
  virtual ~PlumeMetricSubmitter() = default;

  /// Posts the record under the number that the service knows its layout by. It
  /// is serialised before this returns and stays the caller's.
  virtual void postMetric(std::uint32_t metric, const ProtobufMessage& record) = 0;
};

}  // namespace tal
