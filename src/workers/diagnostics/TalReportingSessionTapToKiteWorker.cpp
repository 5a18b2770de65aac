#include "workers/diagnostics/TalReportingSessionTapToKiteWorker.h"

#include <optional>
#include <string>

#include "workers/derived/TalReportingSessionWorkerUtility.h"

namespace tal {

namespace {

constexpr std::string_view kSettingsDomain = "org.vantle.talsys.talreporting";
constexpr std::string_view kBackOffKey = "ParleyInvalidXyBackOffSeconds";
constexpr std::string_view kLastRunKey = "ParleyInvalidXyTTKlastRun";
constexpr double kQuietSecondsAfterFirstMessage = 5.0;

}  // namespace

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionTapToKiteWorkerClass::initWithSession(
    TalReportingSession& session) {
  const Platform& platform = session.platform();
  if (!platform.internal_build) return nullptr;
  const auto back_off = platform.settings.value(kSettingsDomain, kBackOffKey);
  if (!back_off) {
    TAL_LOG_DEBUG(platform.log.session, kBackOffKey,
                  " default not set. Skipping worker. reporterID=", session.reporterID());
    return nullptr;
  }
  return std::make_unique<TalReportingSessionTapToKiteWorker>(session, back_off->toDouble());
}

bool TalReportingSessionTapToKiteWorker::interestedInMessage(const TalReportingSessionMessage& message) {
  const double time = TalReportingSession::getEpochTimeFromTalReportingStateMessage(message);
  if (minimum_message_time_ <= 0) {
    minimum_message_time_ = time + kQuietSecondsAfterFirstMessage;
    return false;
  }
  // The back-off comes last, as asking for it uses it up.
  return time > minimum_message_time_ && TalReportingSessionWorkerUtility::isParleyXYerrorMessage(message) &&
         !hasRunInTimeframe(back_off_time_, kLastRunKey);
}

bool TalReportingSessionTapToKiteWorker::hasRunInTimeframe(double timeframe, std::string_view key) {
  const Platform& platform = session_.platform();
  const double now = platform.clock.secondsSince1970();
  const auto last_run = platform.settings.value(kSettingsDomain, key);
  if (last_run && last_run->toDouble() > now - timeframe) {
    TAL_LOG_DEBUG(log(), "Tap to kite has run. key=", key, " lastRun=", last_run->text());
    return true;
  }
  TAL_LOG_DEBUG(log(), "Tap to kite has not run. key=", key, " backoffSeconds=", timeframe);
  platform.settings.setValue(kSettingsDomain, key, now);
  return false;
}

bool TalReportingSessionTapToKiteWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (!interestedInMessage(*message)) return false;
  if (has_run_) {
    TAL_LOG_DEBUG(log(),
                  "Tap to kite has already run for ParleyXYerrorMessage reporterID=", session_.reporterID());
    return false;
  }
  has_run_ = true;
  TAL_LOG(log(), "Starting tap to kite for ParleyXYerrorMessage reporterID=", session_.reporterID());
  session_.platform().tap_to_kite.createDraft(
      kiteDraftForParleyXYerror(), session_.clientProcessName(),
      "a Parley spatial positioning error occurred",
      // The channel outlives every session and may be used on any thread.
      [&log = log()](const std::optional<std::string>& error) {
        if (error) {
          TAL_LOG_ERROR(log, "Error creating draft - ", *error);
        } else {
          TAL_LOG_INFO(log, "Successfully created draft");
        }
      });
  return false;
}

void TalReportingSessionTapToKiteWorker::stop() {
  TAL_LOG_DEBUG(log(), "Resetting hasRun to false. reporterID=", session_.reporterID());
  has_run_ = false;
}

KiteDraft TalReportingSessionTapToKiteWorker::kiteDraftForParleyXYerror() {
  return {.title = "Invalid x/y coordinates during a Parley call (TTK)",
          .problem_description =
              "Invalid coordinates were provided to the audio layer during a Parley call, making it "
              "impossible to render spatial audio correctly. Filing this kite will help determine what went "
              "wrong.",
          .component = {.name = "Parley Core - Dialworks", .version = "All", .identifier = 1084682},
          .reproducibility = 6,
          .classification = 7,
          .diagnostic_extension_identifiers = {"org.vantle.Probekit.audio"}};
}

}  // namespace tal
