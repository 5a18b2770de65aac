#pragma once

// Has a hang trace captured ("drops a flutter") when a client reports an overload
// that is worth one. Internal builds alone, where the setting asks for it.

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "core/MessageValue.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// From when on an overload is worth a trace. Every worker that is made reads
/// them anew, for all workers.
struct FlutterThresholds {
  std::int32_t io_buffer_size = 0;  ///< frames
  std::int32_t io_cycle = 0;
  double wait_time = 0;  ///< microseconds before a capture
};

/// At most one capture in ten seconds per session.
class TalReportingSessionDPWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// Both outlive the worker.
  TalReportingSessionDPWorker(TalReportingSession& session, const FlutterThresholds& thresholds)
      : session_(session), thresholds_(thresholds) {}

  std::optional<bool> start() override { return true; }
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  bool interestedInMessage(const TalReportingSessionMessage& message) const;

 private:
  const LogChannel& log() const { return session_.platform().log.flutter; }
  bool conditionsAreMet(const TalReportingSessionMessage& message, double now) const;
  void waitUntilTheMomentsAfterAreTraced() const;
  void dropFlutter(const TalReportingSessionMessage& message);

  TalReportingSession& session_;
  const FlutterThresholds& thresholds_;
  double last_message_time_ = 0;  // seconds since 1970; 0: never
};

class TalReportingSessionDPWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `platform` outlives the class.
  explicit TalReportingSessionDPWorkerClass(const Platform& platform)
      : TalReportingSessionWorkerClass("TalReportingSessionDPWorker", {.is_consumer = true}),
        platform_(platform) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;

 private:
  std::optional<MessageValue> getUserDefaults(std::string_view key) const;
  bool getEnableFlag(std::string_view key) const;
  std::int32_t getRunTimeDefaults(std::string_view key) const;
  double getDoubleRunTimeDefaults(std::string_view key) const;

  const Platform& platform_;
  FlutterThresholds thresholds_;
};

}  // namespace tal
