#include "daemon/StoreDurabilityGate.h"

namespace tal {

void StoreDurabilityGate::setListener(Listener* listener) {
  if (!listener) {
    store_.observeProgress(nullptr);
    store_.observeBackLog(nullptr);
    return;
  }
  store_.observeProgress(
      [listener](std::uint64_t settled_through) { listener->rowsSettled(settled_through); });
  store_.observeBackLog([this, listener] {
    if (!store_.overBound()) listener->backlogRelieved();
  });
}

}  // namespace tal
