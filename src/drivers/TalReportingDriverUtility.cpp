#include "drivers/TalReportingDriverUtility.h"

#include <algorithm>
#include <array>
#include <utility>

namespace tal {

namespace {

struct DriverRow {
  const char* group;  // null: any
  const char* subgroup;
};

// Sampled in this order.
constexpr std::array kDrivers{DriverRow{"VantleAE2MCA", nullptr},
                              DriverRow{"Speaker", nullptr},
                              DriverRow{nullptr, "MCA"},
                              DriverRow{"Haptics", "Stats"},
                              DriverRow{"StateTransitionTimes_ms", nullptr},
                              DriverRow{"Rx", nullptr},
                              DriverRow{"Tx", nullptr},
                              DriverRow{nullptr, "IOAudio2"},
                              DriverRow{"pdm", nullptr}};

// Formats that feeds deliver and nobody reports.
constexpr std::uint8_t kInvalidFormat = 0;
constexpr std::uint8_t kLastKnownFormat = 4;

std::optional<std::string> nameOrAny(const char* name) {
  return name ? std::optional<std::string>(name) : std::nullopt;
}

std::string shown(const std::optional<std::string>& name) { return name.value_or("(null)"); }

void appendWithoutSeparators(std::string& key, std::string_view part) {
  std::copy_if(part.begin(), part.end(), std::back_inserter(key),
               [](char character) { return character != '_' && character != ' '; });
}

std::string hitsOf(const DriverStatsChannel& channel) {
  std::string hits;
  for (const DriverStatsBucket& bucket : channel.buckets) {
    if (bucket.hits == 0) continue;
    hits += std::to_string(bucket.lower) + '-' + std::to_string(bucket.upper) + ':' +
            std::to_string(bucket.hits) + ';';
  }
  if (!hits.empty()) hits.pop_back();  // in histograms alone the last separator is cut
  return hits;
}

void send(TalReportingSession& session, MessageDict stats, AudioEventType type) {
  if (stats.empty()) return;
  session.sendMessage(
      TalReportingSessionMessage::initWithMessage(std::move(stats), AudioEventCategory::kDrvstats, type));
}

}  // namespace

TalReportingDriverUtility::TalReportingDriverUtility(DriverStatsFeed& feed, const LogChannel& log)
    : feed_(feed), log_(log) {
  TAL_LOG_INFO(log_, "creating drvstats driver utility");
  for (const DriverRow& row : kDrivers) {
    subscribe(TalReportingDriver::driverWithGroupName(nameOrAny(row.group), nameOrAny(row.subgroup)));
  }
}

void TalReportingDriverUtility::subscribe(TalReportingDriver driver) {
  const auto channels = feed_.copyChannels(driver.group_name, driver.sub_group_name);
  if (channels.error) {
    TAL_LOG_ERROR(log_, "error ", *channels.error, " getting channels for driver ", driver.description());
    return;
  }
  if (!channels.value || channels.value->channels.empty()) {
    TAL_LOG_INFO(log_, "couldn't find any channels for driver group ", driver.description());
    return;
  }
  auto made = feed_.createSubscription(*channels.value);
  if (!made.subscription || !made.subscribed_channels) {
    TAL_LOG_ERROR(log_, "error ", made.error, " creating subscription for ", driver.description());
    return;
  }
  TAL_LOG_INFO(log_, "subscribed to group group ", driver.description());
  io_channel_subscriptions_.push_back(
      {std::move(driver), std::move(made.subscription), std::move(*made.subscribed_channels)});
}

template <typename Value>
std::optional<Value> TalReportingDriverUtility::checked(DriverStatsFeed::Result<Value> result) const {
  if (!result.value && result.error) TAL_LOG_ERROR(log_, "DrvstatCreateSamples error ", *result.error);
  return std::move(result.value);
}

TalReportingDriverUtility::SnapShot TalReportingDriverUtility::getSnapShot() {
  SnapShot snap_shot;
  for (const auto& each : io_channel_subscriptions_) {
    const std::string description = each.driver.description();
    TAL_LOG_INFO(log_, "sampling driver ", description);
    if (auto samples = checked(feed_.createSamples(*each.subscription))) {
      snap_shot[description] = std::move(*samples);
    }
  }
  return snap_shot;
}

void TalReportingDriverUtility::sendDriverLogsForSession(TalReportingSession& session,
                                                         const SnapShot* driver_snap_shot) {
  DriverStats stats;
  for (const auto& each : io_channel_subscriptions_) collect(each, driver_snap_shot, stats);
  send(session, std::move(stats.simple), AudioEventType::kSimple);
  send(session, std::move(stats.histogram), AudioEventType::kHistogram);
  send(session, std::move(stats.state), AudioEventType::kState);
}

// One driver's samples are released before the next is sampled.
void TalReportingDriverUtility::collect(const TalReportingIOChannelSubscription& subscription,
                                        const SnapShot* driver_snap_shot, DriverStats& stats) {
  TAL_LOG_INFO(log_, "getting latest samples");
  auto samples = feed_.createSamples(*subscription.subscription);
  TAL_LOG_INFO(log_, "done getting latest samples");
  const auto latest = checked(std::move(samples));
  if (!latest || !driver_snap_shot) return;
  // The feed answers with an error where the driver is not in the snapshot.
  const auto first = driver_snap_shot->find(subscription.driver.description());
  const auto delta = checked(
      feed_.createSamplesDelta(first == driver_snap_shot->end() ? nullptr : first->second.get(), **latest));
  if (!delta) return;
  for (const DriverStatsChannel& channel : *delta) process(channel, stats);
}

void TalReportingDriverUtility::process(const DriverStatsChannel& channel, DriverStats& stats) const {
  switch (channel.description.format) {
    case DriverStatsFormat::kSimple:
      return processSimpleData(channel, stats.simple);
    case DriverStatsFormat::kState:
      return processStateData(channel, stats.state);
    case DriverStatsFormat::kHistogram:
      return processHistogramData(channel, stats.histogram);
  }
  const auto code = static_cast<std::uint8_t>(channel.description.format);
  if (code == kInvalidFormat || code == kLastKnownFormat) {
    TAL_LOG_DEBUG(log_, "Dropping sample of type : ", code, " for group : ", shown(channel.description.group),
                  " subgroup : ", shown(channel.description.subgroup));
  } else {
    TAL_LOG_ERROR(log_, "The DrvstatsFormat ", code,
                  " is not supported group : ", shown(channel.description.group),
                  " subgroup : ", shown(channel.description.subgroup));
  }
}

void TalReportingDriverUtility::processSimpleData(const DriverStatsChannel& channel,
                                                  MessageDict& driver_stats) const {
  if (channel.integer_value < 1) return;
  driver_stats.set(getDriverStatsKey(channel, "Simple"), channel.integer_value);
}

void TalReportingDriverUtility::processStateData(const DriverStatsChannel& channel,
                                                 MessageDict& driver_stats) const {
  std::string text;
  for (const DriverStatsState& state : channel.states) {
    if (state.residency == 0) continue;
    text += "name:" + state.name + ",transition:" + std::to_string(state.in_transition_count) +
            ",residency:" + std::to_string(state.residency) +
            ",duty_cycle:" + std::to_string(state.duty_cycle) + ';';
  }
  TAL_LOG_DEBUG(log_, "the current reported data is : ", text);
  driver_stats.set(getDriverStatsKey(channel, "State"), text);
}

void TalReportingDriverUtility::processHistogramData(const DriverStatsChannel& channel,
                                                     MessageDict& driver_stats) const {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  for (const DriverStatsBucket& bucket : channel.buckets) {
    if (bucket.bounds_status != 0) {
      TAL_LOG_INFO(log_, "Error in getting the bucket bounds : ", bucket.bounds_status);
    }
    lower = std::min(lower, bucket.lower);
    upper = std::max(upper, bucket.upper);
  }
  const std::string hits = hitsOf(channel);
  if (hits.empty()) return;
  driver_stats.set(getDriverStatsKey(channel, "Histogram"),
                   "count=" + std::to_string(channel.buckets.size()) + ",lower=" + std::to_string(lower) +
                       ",upper=" + std::to_string(upper) + ",min=" + std::to_string(channel.minimum) +
                       ",max=" + std::to_string(channel.maximum) +
                       ",unit=" + shown(channel.description.unit_label) + "::" + hits);
}

std::string TalReportingDriverUtility::getDriverStatsKey(const DriverStatsChannel& channel,
                                                         std::string_view type) {
  const DriverStatsDescription& description = channel.description;
  std::string key;
  const auto append = [&key](std::string_view part) {
    appendWithoutSeparators(key, part);
    key += '_';
  };
  if (description.driver_name) {
    append(std::string_view(*description.driver_name).substr(0, description.driver_name->find('<')));
  }
  if (description.group) append(*description.group);
  if (description.subgroup) append(*description.subgroup);
  append(type);
  if (description.channel_name) appendWithoutSeparators(key, *description.channel_name);
  return key;
}

}  // namespace tal
