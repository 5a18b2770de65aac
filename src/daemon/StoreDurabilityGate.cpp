#include "daemon/StoreDurabilityGate.h"

namespace tal {

void StoreDurabilityGate::setListener(Listener* listener) {
  if (!listener) {
    store_.observeProgress(nullptr);
    store_.observeBackLog(nullptr);
    queues_.observeBackLog(nullptr);
    return;
  }
  store_.observeProgress(
      [listener](std::uint64_t settled_through) { listener->rowsSettled(settled_through); });
  const auto tell = [this, listener] {
    if (!backlogIsOverBound()) listener->backlogRelieved();
  };
  store_.observeBackLog(tell);
  queues_.observeBackLog(tell);
}

}  // namespace tal
