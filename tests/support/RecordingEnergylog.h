#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/EnergylogSink.h"

namespace tal::test {

/// Keeps every event.
class RecordingEnergylog final : public EnergylogSink {
 public:
  struct Event {
    std::int32_t event_class;
    std::string name;
    MessageDict payload;
  };

  void logRegisteredEvent(std::int32_t event_class, std::string_view name,
                          const MessageDict& payload) override {
    events.push_back({event_class, std::string(name), payload});
  }

  std::vector<Event> events;
};

}  // namespace tal::test
