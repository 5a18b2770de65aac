#include "accessories/TalReportingSessionAudioRegistrationWorker.h"

#include <chrono>
#include <cstdint>
#include <string_view>
#include <utility>

namespace tal {

namespace {

using Outcome = RegistrationAttempt::Outcome;

constexpr std::string_view kSuite = "org.vantle.talsys.talreporting";
constexpr std::string_view kPublishedAt = "audio_registration_published_at";  // seconds since 1970
constexpr std::chrono::hours kPeriod{24};
constexpr std::chrono::minutes kPauseAfterFailure{10};
constexpr std::uint32_t kCategoryProper = 0xFFFF;

}  // namespace

void AudioRegistration::publishIfDue(ReporterID reporter_id) {
  assertOnQueue(platform_.reporting_queue);
  if (attempting_ || !isDue()) return;
  attempting_ = true;
  if (!queue_) queue_ = platform_.queue_pool.makeQueue("org.vantle.talsys.session.audioregistration");
  const auto result = std::make_shared<Result>();
  auto ended = life_.guard([this, result] { attemptEnded(*result); });
  // On the private queue: keeping the time may wait for the disk.
  auto done = [&platform = platform_, result, ended](Outcome outcome, const std::string& reason) {
    *result = {outcome, reason, platform.clock.secondsSince1970()};
    if (outcome == Outcome::kPublished) platform.settings.setValue(kSuite, kPublishedAt, result->at);
    platform.reporting_queue.post(ended);
  };
  std::make_shared<RegistrationAttempt>(
      RegistrationAttempt::Dependencies{.backend = platform_.callstat,
                                        .devices = platform_.bluetooth,
                                        .log = platform_.log.audio_registration,
                                        .queue = queue_},
      reporter_id, std::move(done))
      ->begin();
}

bool AudioRegistration::isDue() {
  if (pause_until_ && platform_.clock.monotonic() < *pause_until_) return false;
  if (!published_at_) {
    const auto kept = platform_.settings.value(kSuite, kPublishedAt);
    if (!kept) return true;
    published_at_ = kept->toDouble();
  }
  const double age = platform_.clock.secondsSince1970() - *published_at_;
  // A time in the future is one of a clock that was wrong.
  return !(age >= 0 && age < std::chrono::duration<double>(kPeriod).count());
}

void AudioRegistration::attemptEnded(const Result& result) {
  const LogChannel& log = platform_.log.audio_registration;
  attempting_ = false;
  if (result.outcome == Outcome::kPublished) {
    published_at_ = result.at;
    bluetooth_was_missing_ = false;
    return;
  }
  pause_until_ = platform_.clock.monotonic() + kPauseAfterFailure;
  if (result.outcome == Outcome::kFailed) {
    TAL_LOG_ERROR(log, "accessories are not registered: ", result.reason);
  } else if (result.outcome == Outcome::kNoBackEnd) {
    TAL_LOG_DEBUG(log, "accessories are not registered: ", result.reason);
  } else if (!std::exchange(bluetooth_was_missing_, true)) {
    TAL_LOG_INFO(log, "accessories are not registered: ", result.reason);
  }
}

std::optional<bool> TalReportingSessionAudioRegistrationWorker::start() {
  registration_.publishIfDue(session_.reporterID());
  return true;
}

bool TalReportingSessionAudioRegistrationWorker::handleMessage(
    const TalReportingSessionMessage::Pointer& message) {
  const auto category = static_cast<std::uint32_t>(message->category()) & kCategoryProper;
  if (category == static_cast<std::uint32_t>(AudioEventCategory::kRouteChange)) {
    registration_.publishIfDue(session_.reporterID());
  }
  return false;
}

}  // namespace tal
