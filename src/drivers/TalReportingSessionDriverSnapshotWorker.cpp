#include "drivers/TalReportingSessionDriverSnapshotWorker.h"

namespace tal {

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionDriverSnapshotWorkerClass::initWithSession(
    TalReportingSession& session) {
  return std::make_unique<TalReportingSessionDriverSnapshotWorker>(session, *this);
}

TalReportingDriverUtility& TalReportingSessionDriverSnapshotWorkerClass::sharedUtility() {
  if (!utility_) utility_.emplace(platform_.driver_stats, platform_.log.driver_utility);
  return *utility_;
}

std::optional<bool> TalReportingSessionDriverSnapshotWorker::start() {
  driver_snap_shot_ = worker_class_.sharedUtility().getSnapShot();
  return true;
}

void TalReportingSessionDriverSnapshotWorker::stop() {
  if (auto* utility = worker_class_.sharedUtilityIfMade()) {
    utility->sendDriverLogsForSession(session_, driver_snap_shot_ ? &*driver_snap_shot_ : nullptr);
  }
  driver_snap_shot_.reset();
}

}  // namespace tal
