#include "workers/sinks/TalReportingSessionDPWorker.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <limits>
#include <string>

#include "core/MessageKeys.h"

namespace tal {

namespace {

constexpr std::string_view kSettingsDomain = "org.vantle.talsys.talreporting";
constexpr std::int32_t kDefaultBufferSize = 512;
// A trace covers the seconds before it: another one so soon tells nothing new.
constexpr double kSecondsBetweenCaptures = 10.0;

constexpr MessageKey kSmallestBufferFrameSize{"smallest_buffer_frame_size"};
constexpr MessageKey kIoCycle{"io_cycle"};

std::int64_t integerUnder(const MessageKey& key, const TalReportingSessionMessage& message) {
  const MessageValue* value = message.message().find(key);
  return value ? value->toInt64() : 0;
}

// What does not fit, as the nearest that does.
std::chrono::microseconds wholeMicroseconds(double count) {
  constexpr double kMost = std::numeric_limits<std::uint32_t>::max();
  if (std::isnan(count)) return {};
  return std::chrono::microseconds(static_cast<std::uint32_t>(std::clamp(count, 0.0, kMost)));
}

}  // namespace

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionDPWorkerClass::initWithSession(
    TalReportingSession& session) {
  const bool enabled = getEnableFlag("enable_flutter");
  if (!platform_.internal_build || !enabled) return nullptr;
  auto worker = std::make_unique<TalReportingSessionDPWorker>(session, thresholds_);
  thresholds_.io_buffer_size = getRunTimeDefaults("io_buffer_size");
  if (thresholds_.io_buffer_size == 0) thresholds_.io_buffer_size = kDefaultBufferSize;
  thresholds_.io_cycle = getRunTimeDefaults("io_cycle");
  thresholds_.wait_time = getDoubleRunTimeDefaults("wait_time");
  return worker;
}

std::optional<MessageValue> TalReportingSessionDPWorkerClass::getUserDefaults(std::string_view key) const {
  auto value = platform_.settings.value(kSettingsDomain, key);
  TAL_LOG_DEBUG(platform_.log.flutter, "Value of ", key, " is ", value ? value->text() : "(null)");
  return value;
}

bool TalReportingSessionDPWorkerClass::getEnableFlag(std::string_view key) const {
  const auto value = getUserDefaults(key);
  return value && value->toBool();
}

std::int32_t TalReportingSessionDPWorkerClass::getRunTimeDefaults(std::string_view key) const {
  using Range = std::numeric_limits<std::int32_t>;
  const auto value = getUserDefaults(key);
  if (!value) return 0;
  return static_cast<std::int32_t>(std::clamp<std::int64_t>(value->toInt64(), Range::min(), Range::max()));
}

double TalReportingSessionDPWorkerClass::getDoubleRunTimeDefaults(std::string_view key) const {
  const auto value = getUserDefaults(key);
  return value ? value->toDouble() : 0.0;
}

bool TalReportingSessionDPWorker::interestedInMessage(const TalReportingSessionMessage& message) const {
  const bool interested =
      message.type() == AudioEventType::kError && message.category() == AudioEventCategory::kIO;
  if (interested) TAL_LOG_INFO(log(), "Interested in overload");
  return interested;
}

bool TalReportingSessionDPWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  const double now = session_.platform().clock.secondsSince1970();
  if (conditionsAreMet(*message, now)) {
    waitUntilTheMomentsAfterAreTraced();
    dropFlutter(*message);
    last_message_time_ = now;
  } else {
    TAL_LOG_DEBUG(log(), "Did not drop flutter, right conditions not met: buffer size : ",
                  integerUnder(kSmallestBufferFrameSize, *message),
                  ", time diff : ", now - last_message_time_,
                  ", io cycle: ", integerUnder(kIoCycle, *message));
  }
  return false;
}

bool TalReportingSessionDPWorker::conditionsAreMet(const TalReportingSessionMessage& message,
                                                   double now) const {
  if (!interestedInMessage(message)) return false;
  if (integerUnder(kSmallestBufferFrameSize, message) < thresholds_.io_buffer_size) return false;
  if (last_message_time_ != 0.0 && now - last_message_time_ <= kSecondsBetweenCaptures) return false;
  return integerUnder(kIoCycle, message) >= thresholds_.io_cycle;
}

// Deliberately holds the reporting queue: the trace is to show what followed the
// overload, and this service has no part in it while it sleeps.
void TalReportingSessionDPWorker::waitUntilTheMomentsAfterAreTraced() const {
  const auto wait = wholeMicroseconds(thresholds_.wait_time);
  if (wait.count() > 0) session_.platform().clock.sleepFor(wait);
}

void TalReportingSessionDPWorker::dropFlutter(const TalReportingSessionMessage& message) {
  const Platform& platform = session_.platform();
  MessageDict payload = message.message().deepCopy();
  TAL_LOG_INFO(log(), "Dropping flutter ", payload.text());
  const MessageValue* application = payload.find(TalReportingApplicationName);
  platform.flutter_requests.requestFlutter({.domain = "org.vantle.talsys",
                                            .type = "AudioOverloads",
                                            .description = application ? application->text() : std::string(),
                                            .payload = std::move(payload),
                                            .flags = {true, true, false, false, false}});
  platform.notify_center.post("org.vantle.talsys.dropped-flutter", std::nullopt);
  TAL_LOG_INFO(log(), "Dropped flutter");
}

}  // namespace tal
