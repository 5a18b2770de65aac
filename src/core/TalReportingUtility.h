#pragma once

// Small functions that the core and the workers share: stamping of derived
// messages, rounding and bucketing of numbers for reports, change detection,
// and a waitable flag.

#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "core/Log.h"
#include "core/MessageDict.h"
#include "core/TimeReading.h"

namespace tal {

/// The nearest whole number that a report's 32 bits hold; clocks can run past them.
std::int32_t TalReportingUtilityNearestInt32(double value);

/// A copy with "talreporting_timestamp" (seconds since 1970), "systemuptime_sec"
/// (nearest second) and "processuptime_ms" set. The last is, despite its name,
/// the processor time that the process has consumed, in milliseconds: reports
/// rely on it.
MessageDict TalReportingUtilityAddDates(const MessageDict& message, const TimeReading& now);

/// round(value * 10^places) / 10^places, halves away from zero. Negative places
/// round to tens, hundreds and so on.
double TalReportingUtilityRoundWithPlaces(double value, int places);

/// Gains from 0 to 1 in steps of 0.0625: four fraction digits name each exactly.
extern const std::span<const double> TalReportingUtilityBucketNumberToStringVolumes;
/// Seconds, from 0 to a day.
extern const std::span<const double> TalReportingUtilityBucketNumberToStringTimes;

/// The text of the bucket nearest to the number, the later one when two are
/// equally near; nothing for an empty list. `buckets` ascend. With
/// `fraction_digits` above 0 the text has at least one fraction digit and at
/// most as many, without trailing zeros beyond the first.
std::optional<std::string> TalReportingUtilityBucketNumberToString(double number,
                                                                   std::span<const double> buckets,
                                                                   std::optional<int> fraction_digits);

/// True when both dictionaries are there, both hold the key, and the values differ.
bool TalReportingUtilityKeyIsPresentAndHasChanged(const MessageKey& key, const MessageDict* first,
                                                  const MessageDict* second);

/// The application name in a configuration, or "Unknown".
MessageValue TalReportingUtilityRetrieveAppName(const MessageDict& configuration);

/// A one-shot hand-off between threads: a condition and the flag that it guards.
struct TalReportingCondition {
  std::mutex mutex;
  std::condition_variable signalled;
  bool flag = false;  // never reset here; whoever uses it again resets it
};

/// Waits until the flag is set; false when a wait timed out. Each time the
/// condition wakes without the flag, the full time-out begins anew. Must not be
/// called on the reporting queue when the signalling side needs that queue.
bool TalReportingUtilityWait(TalReportingCondition& condition, double timeout_seconds,
                             std::string_view wait_text, std::string_view timeout_text,
                             const LogChannel& log);

/// Sets the flag and wakes one waiter.
void TalReportingUtilitySignal(TalReportingCondition& condition);

}  // namespace tal
