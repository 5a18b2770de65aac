#pragma once

// The class of workers that would derive summaries of a device's orientation. No
// session has use for one, so it declines, and it is kept out of the roster.

#include "session/TalReportingSessionWorker.h"

namespace tal {

class TalReportingSessionOrientationMessagesWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionOrientationMessagesWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionOrientationMessagesWorker",
                                       {.is_producer = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession&) override {
    return nullptr;
  }
};

}  // namespace tal
