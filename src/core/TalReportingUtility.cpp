#include "core/TalReportingUtility.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <limits>

#include "core/MessageKeys.h"

namespace tal {

namespace {

constexpr std::array<double, 17> kVolumes{0,      0.0625, 0.125,  0.1875, 0.25,   0.3125, 0.375,  0.4375, 0.5,
                                          0.5625, 0.625,  0.6875, 0.75,   0.8125, 0.875,  0.9375, 1};
constexpr std::array<double, 19> kTimes{0,   1,   2,    5,    10,   15,    30,    60,    120,  300,
                                        600, 900, 1800, 3600, 7200, 14400, 28800, 43200, 86400};

// With the given most fraction digits, at least one of them where there are any.
std::string formatted(double number, int most_digits) {
  char text[512];
  const int length = std::snprintf(text, sizeof text, "%.*f", most_digits, number);
  std::string out(text, static_cast<std::size_t>(std::min<int>(length, sizeof text - 1)));
  const auto point = out.find('.');
  if (point == std::string::npos) return out;
  const auto last = std::max(out.find_last_not_of('0'), point + 1);
  out.resize(last + 1);
  return out;
}

// What a number formatter writes that was told nothing: at most three fraction
// digits, and none that says nothing.
std::string formattedPlainly(double number) {
  constexpr int kMostDigits = 3;
  std::string out = formatted(number, kMostDigits);
  if (out.ends_with(".0")) out.resize(out.size() - 2);
  return out;
}

}  // namespace

const std::span<const double> TalReportingUtilityBucketNumberToStringVolumes{kVolumes};
const std::span<const double> TalReportingUtilityBucketNumberToStringTimes{kTimes};

std::int32_t TalReportingUtilityNearestInt32(double value) {
  constexpr double kMost = std::numeric_limits<std::int32_t>::max();
  return static_cast<std::int32_t>(std::lround(std::clamp(value, -kMost, kMost)));
}

MessageDict TalReportingUtilityAddDates(const MessageDict& message, const TimeReading& now) {
  constexpr float kTicksPerSecond = 1'000'000;
  constexpr float kMillisecondsPerSecond = 1000;
  MessageDict dated = message;
  dated.set(TalReportingInternalEventEpochTime, now.seconds_since_1970);
  dated.set(TalReportingInternalEventSystemUptimeSec, TalReportingUtilityNearestInt32(now.uptime_seconds));
  const float milliseconds =
      static_cast<float>(now.processor_ticks) / kTicksPerSecond * kMillisecondsPerSecond;
  dated.set(TalReportingInternalEventProcessUptimeMS,
            TalReportingUtilityNearestInt32(static_cast<double>(milliseconds)));
  return dated;
}

double TalReportingUtilityRoundWithPlaces(double value, int places) {
  const double scale = std::pow(10.0, places);
  return std::round(value * scale) / scale;
}

std::optional<std::string> TalReportingUtilityBucketNumberToString(double number,
                                                                   std::span<const double> buckets,
                                                                   std::optional<int> fraction_digits) {
  if (buckets.empty()) return std::nullopt;
  double kept = buckets.front();
  double distance = std::abs(number - kept);
  for (const double bucket : buckets.subspan(1)) {
    const double next = std::abs(number - bucket);
    if (next > distance) break;
    kept = bucket;
    distance = next;
  }
  return fraction_digits ? formatted(kept, std::max(*fraction_digits, 0)) : formattedPlainly(kept);
}

bool TalReportingUtilityKeyIsPresentAndHasChanged(const MessageKey& key, const MessageDict* first,
                                                  const MessageDict* second) {
  const MessageValue* before = first ? first->find(key) : nullptr;
  const MessageValue* after = second ? second->find(key) : nullptr;
  return before && after && !(*before == *after);
}

MessageValue TalReportingUtilityRetrieveAppName(const MessageDict& configuration) {
  const MessageValue* name = configuration.find(TalReportingApplicationName);
  return name ? *name : MessageValue::literal(kUnknownApplicationName);
}

bool TalReportingUtilityWait(TalReportingCondition& condition, double timeout_seconds,
                             std::string_view wait_text, std::string_view timeout_text,
                             const LogChannel& log) {
  std::unique_lock lock(condition.mutex);
  while (!condition.flag) {
    TAL_LOG_INFO(log, wait_text);
    const std::chrono::duration<double> timeout(timeout_seconds);
    if (condition.signalled.wait_for(lock, timeout) == std::cv_status::timeout) {
      TAL_LOG_ERROR(log, timeout_text);
      return false;
    }
    TAL_LOG_INFO(log, "continuing");
  }
  return true;
}

void TalReportingUtilitySignal(TalReportingCondition& condition) {
  const std::lock_guard lock(condition.mutex);
  condition.flag = true;
  condition.signalled.notify_one();
}

}  // namespace tal
