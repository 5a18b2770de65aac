#pragma once

// What the transport asks of the store, answered by the store's writer.

#include "platform/DurabilityGate.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Threads and promises are those of DurabilityGate.
class StoreDurabilityGate final : public DurabilityGate {
 public:
  /// `store` outlives the gate.
  explicit StoreDurabilityGate(StoreWriter& store) : store_(store) {}

  std::uint64_t lastRow() const override { return store_.sequence(); }
  bool wasGivenUp(std::uint64_t first_row, std::uint64_t last_row) const override {
    return store_.wasGivenUp({first_row, last_row});
  }
  void commitSoon() override { store_.requestCommit(store_.sequence()); }
  bool backlogIsOverBound() const override { return store_.overBound(); }
  void setListener(Listener* listener) override;

 private:
  StoreWriter& store_;
};

}  // namespace tal
