#pragma once

// Counts a session's active periods and overloads, and at its stop sends one
// summary of the session and of the state of the device.

#include <cstdint>
#include <memory>
#include <optional>

#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// The summary is a message of category 0x08000001 ("Session_Generic"), type Summary.
class TalReportingSessionSummaryWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// `session` outlives the worker.
  explicit TalReportingSessionSummaryWorker(TalReportingSession& session) : session_(session) {}

  std::optional<bool> start() override { return true; }
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  void stop() override;

  double totalActiveTime() const { return total_active_time_; }
  std::uint32_t activeCount() const { return active_count_; }
  std::uint32_t overloadCount() const { return overload_count_; }

 private:
  MessageDict sessionFigures() const;
  void addDeviceFigures(MessageDict& summary) const;

  TalReportingSession& session_;
  // Never reset: a second stop tells of the whole life of the worker.
  double total_active_time_ = 0;  // seconds
  std::uint32_t active_count_ = 0;
  std::uint32_t overload_count_ = 0;
};

class TalReportingSessionSummaryWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  TalReportingSessionSummaryWorkerClass()
      : TalReportingSessionWorkerClass("TalReportingSessionSummaryWorker",
                                       {.is_consumer = true, .is_producer = true}) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionSummaryWorker>(session);
  }
};

}  // namespace tal
