#pragma once

#include <string>

#include "platform/PlumeMetricSubmitter.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Metric records as rows of the store's table `metrics`, in their binary
/// encoding. A record is durable once its row is committed. Lives on the
/// reporting queue.
class StorePlumeMetricSubmitter final : public PlumeMetricSubmitter {
 public:
  /// Both outlive the object.
  StorePlumeMetricSubmitter(StoreWriter& store, const Clock& clock) : store_(store), clock_(clock) {}

  void postMetric(std::uint32_t metric, const ProtobufMessage& record) override;

 private:
  StoreWriter& store_;
  const Clock& clock_;
};

}  // namespace tal
