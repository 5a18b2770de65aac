#pragma once

#include <memory>

#include "session/TalReportingSessionWorker.h"

namespace tal {

/// A class that applies to no session. It holds a class's place in the roster,
/// with its name and flags, on a system that has nothing for the class to do.
class DecliningWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  using TalReportingSessionWorkerClass::TalReportingSessionWorkerClass;

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession&) override {
    return nullptr;
  }
};

}  // namespace tal
