#include "platform/linux/store/StoreAnalyticsSink.h"

#include "core/MessageJson.h"

namespace tal {

namespace {
// One unusually large payload does not keep its memory.
constexpr std::size_t kMostPayloadKept = std::size_t{64} * 1024;
}  // namespace

void StoreAnalyticsSink::sendEventWithPayloadProvider(std::string_view name,
                                                      const PayloadProvider& provider) {
  payload_.clear();
  appendJson(payload_, provider());
  store_.append({.table = StoreTable::kEvents,
                 .recorded_at = clock_.secondsSince1970(),
                 .number = 0,
                 .name = name,
                 .payload = payload_});
  if (payload_.capacity() > kMostPayloadKept) std::string().swap(payload_);
}

}  // namespace tal
