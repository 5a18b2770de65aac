#include "tracing/TalReportingSessionTraceWorker.h"

#include <cmath>

#include "core/MessageKeys.h"
#include "tracing/TraceConfiguration.h"

namespace tal {

namespace {

using namespace std::chrono_literals;
constexpr std::chrono::nanoseconds kStartTimeout = 15s;
constexpr std::chrono::nanoseconds kStopTimeout = 180s;

}  // namespace

TalReportingSessionTraceWorker::TalReportingSessionTraceWorker(TalReportingSession& session,
                                                               const TracingPlatform& tracing,
                                                               SkeinClasses& skein)
    : session_(session), tracing_(tracing), skein_(skein) {
  if (session_.configuration().contains(kSkeinOutputFileNameKey)) {
    perf_data_name_ = configured(kSkeinOutputFileNameKey);
  }
}

TalReportingSessionTraceWorker::~TalReportingSessionTraceWorker() {
  if (events_) events_->abandon();
}

std::string TalReportingSessionTraceWorker::configured(const MessageKey& key) const {
  const MessageValue* value = session_.configuration().find(key);
  return value ? value->text() : "";
}

bool TalReportingSessionTraceWorker::mayTrace() const {
  return session_.serviceType() == AudioServiceType::kTest && session_.platform().internal_build;
}

std::optional<bool> TalReportingSessionTraceWorker::start() {
  if (started_tracing_ || !mayTrace()) return started();
  if (!readProbeList().bytes) {
    TAL_LOG_ERROR(session_.platform().log.session,
                  "Could not start Perftrail. TalReportingSkeinPlistFilePath: ",
                  configured(kSkeinPlistFilePathKey), " is not a valid path");
    return started();
  }
  using Template = PerftrailConfiguration::Template;
  auto configuration = tracing_.perftrail.makeConfiguration(
      configured(kTraceTypeKey) == kTraceTypeProfile ? Template::kProfiling : Template::kDefault);
  configuration->compression = false;
  auto session = tracing_.perftrail.makeSession(*configuration);
  if (!events_) events_ = std::make_shared<TraceEvents>(tracing_.make_semaphore(), log());
  session->setDelegate(events_);
  events_->begin(std::move(configuration), session);

  key_variables_ = {{"start_time", MessageDate{session_.platform().clock.secondsSince1970()}}};
  started_tracing_ = true;
  session->start();
  return waitForStart();
}

bool TalReportingSessionTraceWorker::waitForStart() {
  if (events_->wait(kStartTimeout)) return true;
  TAL_LOG(log(), "timed out waiting for performance trace to start");
  const auto session = events_->traceSession();
  if (session && session->isValid()) session->stop();
  return false;
}

void TalReportingSessionTraceWorker::stop() {
  if (!started_tracing_ || !mayTrace()) return;
  started_tracing_ = false;
  if (!events_->traceSession()) return;
  if (waitForEnd()) {
    processTraceSkein(events_->finalTraceURL());
  } else {
    // The two blanks and "wil" are what log readers match.
    TAL_LOG(log(), "timed out waiting for performance trace to stop.  No pdj file wil be generated. ");
  }
}

// Within the delay a signal means that the trace has broken off: nothing is left to be stopped then.
bool TalReportingSessionTraceWorker::waitForEnd() {
  const auto delay = endDelay();
  if (delay > 0s && events_->wait(delay)) return true;
  if (const auto session = events_->traceSession()) session->stop();
  return events_->wait(kStopTimeout - delay);
}

std::chrono::nanoseconds TalReportingSessionTraceWorker::endDelay() const {
  const MessageValue* value = session_.configuration().find(kPerfEndDelayKey);
  if (!value) return 0s;
  const double seconds = value->isNumber() ? value->toDouble() : -1;
  // NaN is no number of seconds either.
  if (seconds >= 0 && seconds < std::chrono::duration<double>(kStopTimeout).count()) {
    return std::chrono::duration_cast<std::chrono::nanoseconds>(std::chrono::duration<double>(seconds));
  }
  TAL_LOG_ERROR(log(), "ignoring TalReportingPerfEndDelay ", value->text(),
                ": not from 0 to under 180 seconds");
  return 0s;
}

}  // namespace tal
