#pragma once

// The faults that the bug-capture worker watches for. What they log bears the
// worker's name, so their sources are parts of the worker's.

#include <memory>
#include <vector>

#include "workers/diagnostics/TalReportingHoundWorkerInstance.h"

namespace tal {

/// The key under which the power log tells of haptics that were left running.
inline constexpr MessageKey kHapticActiveHardwareTimeSeconds{"Haptic_Active_Hardware_Time_Seconds"};
/// The same for a system sound.
inline constexpr MessageKey kSystemSoundStuckTimeSeconds{"System_Sound_Stuck_Time_Seconds"};

/// A power-log message with one certain key, counted over all sessions, leads to
/// a snapshot of the processes of the session that sent the last one.
class TalReportingHoundWorkerInstanceLeaks : public TalReportingHoundWorkerInstance {
 public:
  struct Fault {
    MessageKey watched_key;
    AudioServiceType service_type;
    std::string_view words;  ///< in the reply's line
  };

  TalReportingHoundWorkerInstanceLeaks(TalReportingSession& session,
                                       std::shared_ptr<WorkerInstanceState> state, const Fault& fault)
      : TalReportingHoundWorkerInstance(session, std::move(state)), fault_(fault) {}

  bool interestedInMessage(const TalReportingSessionMessage& message) const override;
  void fire(const TalReportingSessionMessage& message) override;

 private:
  MessageDict processIdentifierPayload() const;

  const Fault& fault_;
};

class TalReportingHoundWorkerInstanceHapticLeaks final : public TalReportingHoundWorkerInstanceLeaks {
 public:
  TalReportingHoundWorkerInstanceHapticLeaks(TalReportingSession& session, HoundInstanceRegistry& registry);
};

/// Captures at most once in 15 seconds, whichever sessions ask.
class TalReportingHoundWorkerInstanceSSSLeaks final : public TalReportingHoundWorkerInstanceLeaks {
 public:
  TalReportingHoundWorkerInstanceSSSLeaks(TalReportingSession& session, HoundInstanceRegistry& registry);

  void fire(const TalReportingSessionMessage& message) override;

 private:
  HoundInstanceRegistry::LastFire& last_fire_;
};

/// An alarm that is told three times to play too quietly opens a capture of a
/// minute, which is cancelled when the alarm stops before.
class TalReportingHoundWorkerInstanceAlarmLowRMS final : public TalReportingHoundWorkerInstance {
 public:
  explicit TalReportingHoundWorkerInstanceAlarmLowRMS(TalReportingSession& session);

  bool interestedInMessage(const TalReportingSessionMessage& message) const override;
  void fire(const TalReportingSessionMessage& message) override;
  void stop() override;

 private:
  double houndAlarmLowRmsDuration = 60.0;
};

/// Holds a place: it is interested in nothing and never fires.
class TalReportingHoundWorkerInstanceAvvcDestroyRecordQueue final : public TalReportingHoundWorkerInstance {
 public:
  explicit TalReportingHoundWorkerInstanceAvvcDestroyRecordQueue(TalReportingSession& session)
      : TalReportingHoundWorkerInstance(session, std::make_shared<WorkerInstanceState>()) {}

  bool interestedInMessage(const TalReportingSessionMessage&) const override { return false; }
  bool implementsFire() const override { return false; }
};

/// All of them, in their fixed order.
std::vector<TalReportingHoundWorkerInstanceClass> allHoundWorkerInstanceClasses();

}  // namespace tal
