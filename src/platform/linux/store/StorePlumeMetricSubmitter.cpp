#include "platform/linux/store/StorePlumeMetricSubmitter.h"

namespace tal {

void StorePlumeMetricSubmitter::postMetric(std::uint32_t metric, const ProtobufMessage& record) {
  std::string bytes;
  ProtobufWriter writer(bytes);
  record.writeTo(writer);
  store_.append({.table = StoreTable::kMetrics,
                 .recorded_at = clock_.secondsSince1970(),
                 .number = metric,
                 .name = {},
                 .payload = bytes});
}

}  // namespace tal
