#pragma once

// Publishes which wireless audio accessories the device is paired with, so that a
// fleet knows what its audio is played on.

#include <memory>
#include <optional>
#include <string>

#include "accessories/RegistrationAttempt.h"
#include "platform/LifeToken.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// When the inventory was last published, and the attempts to publish it: one
/// for the whole device. Lives on the reporting queue.
///
/// At most one inventory in 24 hours, also when the daemon is started anew
/// meanwhile: the time is kept in the settings. After an attempt that came to
/// nothing the next one waits ten minutes.
class AudioRegistration {
 public:
  /// `platform` outlives the object.
  explicit AudioRegistration(const Platform& platform) : platform_(platform) {}
  AudioRegistration(const AudioRegistration&) = delete;
  AudioRegistration& operator=(const AudioRegistration&) = delete;

  /// Publishes the inventory if it is due, in the name of this reporter; returns
  /// at once either way.
  void publishIfDue(ReporterID reporter_id);

 private:
  struct Result {
    RegistrationAttempt::Outcome outcome;
    std::string reason;
    double at;  // seconds since 1970
  };
  bool isDue();
  void attemptEnded(const Result& result);

  const Platform& platform_;
  std::optional<double> published_at_;  // seconds since 1970; nothing: not asked for yet, or never
  std::optional<Clock::Instant> pause_until_;
  bool attempting_ = false;
  bool bluetooth_was_missing_ = false;  // said once
  std::shared_ptr<SerialQueue> queue_;
  LifeToken life_;
};

/// Sees to it that the inventory is published: when its session starts, and when
/// a route changes, since accessories come and go then. Keeps nothing.
class TalReportingSessionAudioRegistrationWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// Both outlive the worker.
  TalReportingSessionAudioRegistrationWorker(TalReportingSession& session, AudioRegistration& registration)
      : session_(session), registration_(registration) {}

  std::optional<bool> start() override;
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;

 private:
  TalReportingSession& session_;
  AudioRegistration& registration_;
};

class TalReportingSessionAudioRegistrationWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `platform` outlives the class.
  explicit TalReportingSessionAudioRegistrationWorkerClass(const Platform& platform)
      : TalReportingSessionWorkerClass("TalReportingSessionAudioRegistrationWorker", {.is_consumer = true}),
        registration_(platform) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionAudioRegistrationWorker>(session, registration_);
  }

 private:
  AudioRegistration registration_;
};

}  // namespace tal
