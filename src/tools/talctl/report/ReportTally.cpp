#include "tools/talctl/report/ReportTally.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <utility>

#include "core/TalReportingUtility.h"
#include "tools/talctl/report/JsonMembers.h"

namespace tal::talctl {
namespace {

// No stretch is that long: what claims it is some client's own invention, and would drown all others.
constexpr double kLongestSeconds = 366.0 * 86400;
// What is placed on the time line of one stretch; the store keeps no longer by default.
constexpr double kLongestPlacedSeconds = 31.0 * 86400;
// Before 1970 and after 9999 there are no days to draw.
constexpr double kLatestTime = 253402300799.0;
constexpr std::size_t kMostErrorKinds = 10000;
// What no client has said it is.
constexpr std::string_view kNoIssue;
constexpr char kServiceEnd = '\0';

double secondsOf(std::string_view value) {
  const double seconds = numberOf(value);
  return std::isfinite(seconds) && seconds > 0 && seconds <= kLongestSeconds ? seconds : 0;
}

std::uint64_t countOf(std::string_view value) {
  constexpr double kMost = 1e9;
  const double count = numberOf(value);
  return count > 0 && count <= kMost ? static_cast<std::uint64_t>(count) : 0;
}

double volumeOf(std::string_view value) {
  const double volume = numberOf(value);
  return std::isfinite(volume) ? volume : 0;
}

/// The bucket that the derivation has chosen, else the one nearest to the volume.
std::size_t bucketOf(std::string_view bucket, double volume) {
  const auto buckets = TalReportingUtilityBucketNumberToStringVolumes;
  const bool is_text = bucket.size() > 2 && bucket.front() == '"';
  const double number = is_text ? volumeOf(bucket.substr(1, bucket.size() - 2)) : volume;
  std::size_t nearest = 0;
  for (std::size_t i = 1; i < buckets.size() && i < kVolumeBucketCount; ++i) {
    if (std::abs(number - buckets[i]) <= std::abs(number - buckets[nearest])) nearest = i;
  }
  return nearest;
}

std::string formatText(std::string_view format, std::string_view encoding, std::string_view channels) {
  std::string buffer;
  std::string text(textOf(format, buffer));
  const std::string_view id = textOf(encoding, buffer);
  if (id != "unknown") text.append(", ").append(id);
  if (numberOf(channels) >= 1) text.append(", ").append(channels).append(" ch");
  return text;
}

}  // namespace

ApplicationName ReportTally::applicationOf(std::string_view name) {
  const std::size_t end = name.find(kServiceEnd);
  if (end == std::string_view::npos) return {std::string(name), {}};
  return {std::string(name.substr(end + 1)), std::string(name.substr(0, end))};
}

Usage& ReportTally::application(std::string_view service, std::string_view value) {
  key_.assign(service);
  key_ += kServiceEnd;
  key_ += textOf(value, text_);
  return applications_.of(key_);
}

void ReportTally::add(const ReportedName& name, double recorded_at, std::string_view payload) {
  switch (name.kind) {
    case ReportKind::kPlaying:
      return addPlaying(name, recorded_at, payload);
    case ReportKind::kRecording:
      return addRecording(name, recorded_at, payload);
    case ReportKind::kStreamEnd:
      return addStreamEnd(name, payload);
    case ReportKind::kTrouble:
      return addTrouble(name, recorded_at, payload);
    case ReportKind::kRowsGivenUp: {
      std::array<std::string_view, 1> values;
      if (!pickMembers(payload, std::array<std::string_view, 1>{"rows"}, values)) ++unreadable_;
      rows_given_up_ += countOf(values[0]);
    }
  }
}

void ReportTally::addPlaying(const ReportedName& name, double recorded_at, std::string_view payload) {
  constexpr std::array<std::string_view, 10> kKeys{"HostApplicationDisplayID",
                                                   "active_devices",
                                                   "session_selected_format",
                                                   "mFormatID",
                                                   "mChannelsPerFrame",
                                                   "play_seconds",
                                                   "RvSessionVolume",
                                                   "RvSessionVolumeBucketed",
                                                   "msgidx",
                                                   "msgcnt"};
  std::array<std::string_view, kKeys.size()> values;
  if (!pickMembers(payload, kKeys, values)) {
    ++unreadable_;
    return;
  }
  const auto& [app, device, format, encoding, channels, played, volume, bucket, index, count] = values;
  const double seconds = secondsOf(played);
  if (seconds == 0) return;
  const Usage usage{.played_seconds = seconds, .volume_seconds = volumeOf(volume) * seconds, .stretches = 1};
  application(name.service, app) += usage;
  devices_.of(textOf(device, text_)) += usage;
  formats_.of(formatText(format, encoding, channels)) += usage;
  volumes_[bucketOf(bucket, volumeOf(volume))] += seconds;
  addStretch(playing_, &Usage::played_seconds, recorded_at, seconds, index, count);
}

void ReportTally::addRecording(const ReportedName& name, double recorded_at, std::string_view payload) {
  constexpr std::array<std::string_view, 5> kKeys{"HostApplicationDisplayID", "active_devices",
                                                  "inputrunning_seconds", "msgidx", "msgcnt"};
  std::array<std::string_view, kKeys.size()> values;
  if (!pickMembers(payload, kKeys, values)) {
    ++unreadable_;
    return;
  }
  const auto& [app, device, recorded, index, count] = values;
  const double seconds = secondsOf(recorded);
  if (seconds == 0) return;
  const Usage usage{.recorded_seconds = seconds, .stretches = 1};
  application(name.service, app) += usage;
  devices_.of(textOf(device, text_)) += usage;
  addStretch(recording_, &Usage::recorded_seconds, recorded_at, seconds, index, count);
}

void ReportTally::addStreamEnd(const ReportedName& name, std::string_view payload) {
  // Most stops end no stream: one search for a word is quicker than a look at every member.
  if (payload.find("\"xrun_episodes\"") == std::string_view::npos) return;
  constexpr std::array<std::string_view, 3> kKeys{"HostApplicationDisplayID", "xrun_episodes",
                                                  "xrun_starved_seconds"};
  std::array<std::string_view, kKeys.size()> values;
  if (!pickMembers(payload, kKeys, values)) {
    ++unreadable_;
    return;
  }
  const auto& [app, episodes, starved] = values;
  if (countOf(episodes) == 0) return;
  application(name.service, app) +=
      Usage{.starved_seconds = secondsOf(starved), .xrun_episodes = countOf(episodes)};
}

void ReportTally::addTrouble(const ReportedName& name, double recorded_at, std::string_view payload) {
  constexpr std::array<std::string_view, 2> kKeys{"HostApplicationDisplayID", "issue_type"};
  std::array<std::string_view, kKeys.size()> values;
  if (!pickMembers(payload, kKeys, values)) {
    ++unreadable_;
    return;
  }
  const auto& [app, issue] = values;
  const bool overload = issue == "\"overload\"";
  const Usage usage{.overload_events = overload ? 1U : 0U, .errors = overload ? 0U : 1U};
  application(name.service, app) += usage;
  if (recorded_at >= 0 && recorded_at <= kLatestTime) {
    slots_[static_cast<std::int64_t>(recorded_at) / kSlotSeconds] += usage;
  }
  if (overload) return;
  std::string issue_text(issue.empty() ? kNoIssue : textOf(issue, text_));
  ErrorKind kind{std::string(name.event), std::move(issue_text), std::string(textOf(app, text_))};
  if (errors_.size() >= kMostErrorKinds && !errors_.contains(kind)) kind = {"more kinds", "", ""};
  ErrorCount& error = errors_[kind];
  ++error.count;
  error.last_at = std::max(error.last_at, recorded_at);
}

void ReportTally::addStretch(Session& session, Seconds field, double recorded_at, double seconds,
                             std::string_view index, std::string_view count) {
  const std::uint64_t number = countOf(index);
  if (number <= 1) place(session, field);
  session.ended_at = recorded_at;
  session.stretches.push_back(seconds);
  if (number >= countOf(count)) place(session, field);
}

void ReportTally::place(Session& session, Seconds field) {
  double end = session.ended_at;
  for (auto stretch = session.stretches.rbegin(); stretch != session.stretches.rend(); ++stretch) {
    spread(std::max(end - *stretch, session.ended_at - kLongestPlacedSeconds), end, field);
    end -= *stretch;
  }
  session.stretches.clear();
}

void ReportTally::spread(double from, double to, Seconds field) {
  from = std::max(from, 0.0);
  if (!(from < to) || to > kLatestTime) return;
  for (auto slot = static_cast<std::int64_t>(from) / kSlotSeconds; from < to; ++slot) {
    const double end = std::min(to, static_cast<double>((slot + 1) * kSlotSeconds));
    slots_[slot].*field += end - from;
    from = end;
  }
}

void ReportTally::merge(const ReportTally& other) {
  applications_.merge(other.applications_);
  devices_.merge(other.devices_);
  formats_.merge(other.formats_);
  for (std::size_t i = 0; i < volumes_.size(); ++i) volumes_[i] += other.volumes_[i];
  for (const auto& [slot, usage] : other.slots_) slots_[slot] += usage;
  for (const auto& [kind, count] : other.errors_) {
    ErrorCount& error = errors_[kind];
    error.count += count.count;
    error.last_at = std::max(error.last_at, count.last_at);
  }
  rows_given_up_ += other.rows_given_up_;
  unreadable_ += other.unreadable_;
}

void ReportTally::finish() {
  place(playing_, &Usage::played_seconds);
  place(recording_, &Usage::recorded_seconds);
}

}  // namespace tal::talctl
