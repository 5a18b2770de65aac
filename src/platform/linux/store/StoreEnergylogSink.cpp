#include "platform/linux/store/StoreEnergylogSink.h"

#include <string>

#include "core/MessageJson.h"

namespace tal {

void StoreEnergylogSink::logRegisteredEvent(std::int32_t event_class, std::string_view name,
                                            const MessageDict& payload) {
  std::string json;
  appendJson(json, payload);
  store_.append({.table = StoreTable::kEnergylog,
                 .recorded_at = clock_.secondsSince1970(),
                 .number = event_class,
                 .name = name,
                 .payload = json});
}

}  // namespace tal
