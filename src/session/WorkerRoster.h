#pragma once

// The worker classes that sessions are made with, in their fixed order, and the
// groups that sessions ask for.

#include <memory>
#include <vector>

#include "core/Log.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// Made once by `main` (a test makes a short one of its own) and handed to every
/// session. Immutable afterwards. The order decides creation order and, within
/// each group, start and stop order.
class WorkerRoster {
 public:
  using Classes = std::vector<TalReportingSessionWorkerClass*>;

  WorkerRoster(std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes, const LogChannel& log);

  /// Every class, valid or not.
  const Classes& getAllWorkerClasses() const { return all_; }
  /// Those that answer `initWithSession`.
  const Classes& validClasses() const { return valid_; }
  const Classes& consumerClasses() const { return consumers_; }
  const Classes& producerClasses() const { return producers_; }
  const Classes& startOnInitClasses() const { return start_on_init_; }

 private:
  std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> owned_;
  Classes all_;
  Classes valid_;
  Classes consumers_;
  Classes producers_;
  Classes start_on_init_;
};

}  // namespace tal
