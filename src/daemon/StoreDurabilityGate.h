#pragma once

// What the transport asks of the store, answered by the store's writer; and of
// the work that is still on its way there.

#include "platform/DurabilityGate.h"
#include "platform/linux/process/ElasticQueuePool.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Threads and promises are those of DurabilityGate.
class StoreDurabilityGate final : public DurabilityGate {
 public:
  /// Both outlive the gate.
  StoreDurabilityGate(StoreWriter& store, ElasticQueuePool& queues) : store_(store), queues_(queues) {}

  std::uint64_t lastRow() const override { return store_.sequence(); }
  bool wasGivenUp(std::uint64_t first_row, std::uint64_t last_row) const override {
    return store_.wasGivenUp({first_row, last_row});
  }
  void commitSoon() override { store_.requestCommit(store_.sequence()); }
  bool backlogIsOverBound() const override { return store_.overBound() || queues_.overBound(); }
  void setListener(Listener* listener) override;

 private:
  StoreWriter& store_;
  ElasticQueuePool& queues_;
};

}  // namespace tal
