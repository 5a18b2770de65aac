#include "tools/talctl/report/AudioReport.h"

#include <algorithm>
#include <chrono>
#include <map>
#include <tuple>

namespace tal::talctl {
namespace {

using std::chrono::sys_days;

std::tm localTime(double seconds_since_1970) {
  const auto seconds = static_cast<std::time_t>(seconds_since_1970);
  std::tm parts{};
  localtime_r(&seconds, &parts);
  return parts;
}

sys_days dayOf(const std::tm& parts) {
  constexpr int kTmEpoch = 1900;
  return sys_days(std::chrono::year(parts.tm_year + kTmEpoch) /
                  std::chrono::month(static_cast<unsigned>(parts.tm_mon) + 1) /
                  std::chrono::day(static_cast<unsigned>(parts.tm_mday)));
}

/// The date with its weekday, whatever the time zone.
std::tm dateOf(sys_days day) {
  constexpr std::chrono::hours kNoon{12};
  const auto seconds = std::chrono::system_clock::to_time_t(day + kNoon);
  std::tm parts{};
  gmtime_r(&seconds, &parts);
  return parts;
}

void addDays(AudioReport& report, const std::map<sys_days, Usage>& used, std::size_t most) {
  if (used.empty()) return;
  sys_days last = used.rbegin()->first;
  sys_days first = used.begin()->first;
  // Days without anything up to today are shown, too, unless they are all that there is to see.
  const sys_days today = dayOf(localTime(report.until));
  if (today > last && today - last < std::chrono::days(most)) last = today;
  if (report.since) first = std::min(first, dayOf(localTime(*report.since)));
  first = std::max(first, last - std::chrono::days(most - 1));
  for (sys_days day = first; day <= last; day += std::chrono::days(1)) {
    const auto found = used.find(day);
    report.days.push_back({dateOf(day), found == used.end() ? Usage() : found->second});
  }
  for (const auto& [day, usage] : used) {
    if (day < first) report.earlier += usage;
  }
}

void addErrors(AudioReport& report, const std::map<ErrorKind, ErrorCount>& errors, std::size_t most) {
  report.errors.assign(errors.begin(), errors.end());
  std::stable_sort(report.errors.begin(), report.errors.end(),
                   [](const auto& a, const auto& b) { return a.second.count > b.second.count; });
  for (std::size_t i = most; i < report.errors.size(); ++i) {
    report.other_errors += report.errors[i].second.count;
  }
  if (report.errors.size() > most) report.errors.resize(most);
}

}  // namespace

AudioReport makeReport(const StoreReading& reading, std::optional<double> since, double until,
                       const ReportLimits& limits) {
  const ReportTally& tally = reading.tally;
  AudioReport report;
  report.since = since;
  report.until = until;
  report.last_at = reading.last_at;
  if (!since) report.since = reading.first_at;
  report.events = reading.events;
  report.unreadable = tally.unreadable();
  report.rows_given_up = tally.rowsGivenUp();
  report.total = tally.total();
  report.applications = tally.applications().ranking(limits.names);
  report.devices = tally.devices().ranking(limits.names);
  report.formats = tally.formats().ranking(limits.names);
  report.volumes = tally.volumes();
  std::map<sys_days, Usage> days;
  for (const auto& [slot, usage] : tally.slots()) {
    const std::tm local = localTime(static_cast<double>(slot * kSlotSeconds));
    report.hours[static_cast<std::size_t>(local.tm_hour)] += usage;
    days[dayOf(local)] += usage;
  }
  addDays(report, days, limits.days);
  addErrors(report, tally.errors(), limits.errors);
  return report;
}

}  // namespace tal::talctl
