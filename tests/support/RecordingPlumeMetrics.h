#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "platform/PlumeMetricSubmitter.h"

namespace tal::test {

/// Keeps every record as the bytes that a metric service would be given.
class RecordingPlumeMetrics final : public PlumeMetricSubmitter {
 public:
  void postMetric(std::uint32_t metric, const ProtobufMessage& record) override {
    ProtobufWriter writer(posted.emplace_back(metric, std::string()).second);
    record.writeTo(writer);
  }

  std::vector<std::pair<std::uint32_t, std::string>> posted;
};

}  // namespace tal::test
