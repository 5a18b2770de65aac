#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Clock.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tal {

/// What bug-capture instances keep beyond the life of a session. One per process,
/// owned by the worker's class object. Lives on the reporting queue.
class HoundInstanceRegistry {
 public:
  /// The state under the class name; `fresh` is stored, and is what it is, where
  /// there is none yet.
  std::shared_ptr<WorkerInstanceState> stateOf(std::string_view class_name,
                                               const WorkerInstanceState& fresh) {
    auto found = states_.find(class_name);
    if (found == states_.end()) {
      found = states_.emplace(class_name, std::make_shared<WorkerInstanceState>(fresh)).first;
    }
    return found->second;
  }

  /// When system-sound leaks were last captured, for whichever session, behind
  /// the lock of its class.
  struct LastFire {
    std::mutex mutex;
    std::optional<Clock::Instant> time;
  };
  LastFire& systemSoundLeaksLastFire() { return system_sound_leaks_last_fire_; }

 private:
  std::map<std::string, std::shared_ptr<WorkerInstanceState>, std::less<>> states_;
  LastFire system_sound_leaks_last_fire_;
};

}  // namespace tal
