#pragma once

#include <string>

#include "platform/AnalyticsSink.h"
#include "platform/linux/store/StoreWriter.h"
#include "platform/linux/store/WantedEvents.h"

namespace tal {

/// Analytics events as rows of the store's table `events`. An event is durable
/// once its row is committed. The payload is written as JSON on the calling
/// queue, since the writer thread has more to do. Lives on the reporting queue.
class StoreAnalyticsSink final : public AnalyticsSink {
 public:
  struct Dependencies {
    StoreWriter& store;
    const Clock& clock;
    WantedEvents::Dependencies wanted;
  };

  /// What is referred to outlives the object.
  explicit StoreAnalyticsSink(Dependencies dependencies)
      : store_(dependencies.store), clock_(dependencies.clock), wanted_(std::move(dependencies.wanted)) {}

  bool eventIsWanted(std::string_view name) override { return wanted_.contains(name); }
  void sendEventWithPayloadProvider(std::string_view name, const PayloadProvider& provider) override;

 private:
  StoreWriter& store_;
  const Clock& clock_;
  WantedEvents wanted_;
  std::string payload_;  // kept for its memory
};

}  // namespace tal
