#pragma once

// Brackets a session with two samplings of the drivers' statistics, and reports
// the difference at its stop.

#include <memory>
#include <optional>

#include "drivers/TalReportingDriverUtility.h"
#include "platform/Platform.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

class TalReportingSessionDriverSnapshotWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `platform` outlives the class.
  explicit TalReportingSessionDriverSnapshotWorkerClass(const Platform& platform)
      : TalReportingSessionWorkerClass("TalReportingSessionDriverSnapshotWorker", {.is_producer = true}),
        platform_(platform) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;

  /// The one utility of the process, made by the first session that starts: the
  /// drivers are subscribed to only once.
  TalReportingDriverUtility& sharedUtility();
  /// Null until a session has started.
  TalReportingDriverUtility* sharedUtilityIfMade() { return utility_ ? &*utility_ : nullptr; }

 private:
  const Platform& platform_;
  std::optional<TalReportingDriverUtility> utility_;
};

/// Each session's worker holds a snapshot of its own, so sessions may overlap.
class TalReportingSessionDriverSnapshotWorker final : public TalReportingSessionWorker {
 public:
  /// Both outlive the worker.
  TalReportingSessionDriverSnapshotWorker(TalReportingSession& session,
                                          TalReportingSessionDriverSnapshotWorkerClass& worker_class)
      : session_(session), worker_class_(worker_class) {}

  std::optional<bool> start() override;
  void stop() override;

 private:
  TalReportingSession& session_;
  TalReportingSessionDriverSnapshotWorkerClass& worker_class_;
  std::optional<TalReportingDriverUtility::SnapShot> driver_snap_shot_;
};

}  // namespace tal
