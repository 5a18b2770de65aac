#pragma once

#include "platform/EnergylogSink.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Power-accounting events as rows of the store's table `energylog`. An event is
/// durable once its row is committed. Lives on the reporting queue.
class StoreEnergylogSink final : public EnergylogSink {
 public:
  /// Both outlive the object.
  StoreEnergylogSink(StoreWriter& store, const Clock& clock) : store_(store), clock_(clock) {}

  void logRegisteredEvent(std::int32_t event_class, std::string_view name,
                          const MessageDict& payload) override;

 private:
  StoreWriter& store_;
  const Clock& clock_;
};

}  // namespace tal
