#include "platform/linux/driver_stats/LinuxDriverStatsFeed.h"

#include <algorithm>
#include <cerrno>
#include <system_error>
#include <utility>

namespace tal {

namespace {

class Subscription final : public DriverStatsSubscription {
 public:
  explicit Subscription(DriverStatsChannelSet wanted) : wanted_(std::move(wanted)) {}
  const DriverStatsChannelSet& wanted() const { return wanted_; }

 private:
  DriverStatsChannelSet wanted_;
};

class SampleSet final : public DriverStatsSampleSet {
 public:
  explicit SampleSet(std::vector<ChannelReading> readings) : readings_(std::move(readings)) {}
  const std::vector<ChannelReading>& readings() const { return readings_; }

  /// The same channel's reading in this set, or null. `index` is where it stood in
  /// another set: there as a rule, unless hardware came or went.
  const ChannelReading* find(const DriverStatsDescription& description, std::size_t index) const {
    if (index < readings_.size() && readings_[index].description == description) return &readings_[index];
    const auto found = std::find_if(readings_.begin(), readings_.end(), [&](const ChannelReading& reading) {
      return reading.description == description;
    });
    return found == readings_.end() ? nullptr : &*found;
  }

 private:
  std::vector<ChannelReading> readings_;
};

template <typename Reading>
bool keep(std::optional<Reading> reading, const DropInChannel& channel, ChannelReadings& readings) {
  if (!reading) return false;
  readings.channels.push_back({channel.description, std::move(*reading)});
  return true;
}

// False for text that is not of the channel's format.
bool parseInto(ChannelReadings& readings, const DropInChannel& channel, std::string_view text) {
  switch (channel.description.format) {
    case DriverStatsFormat::kSimple:
      return keep(parseSimple(text, channel.bits), channel, readings);
    case DriverStatsFormat::kState:
      return keep(parseStates(text, channel.bits), channel, readings);
    case DriverStatsFormat::kHistogram:
      return keep(parseHistogram(text, channel.bits), channel, readings);
  }
  return false;
}

}  // namespace

LinuxDriverStatsFeed::LinuxDriverStatsFeed(Options options)
    : drop_in_directory_(options.config_directory / "drvstats.d"),
      log_(options.log),
      files_(std::move(options.root)),
      hardware_(files_, options.kernel_long_bits) {}

DriverStatsFeed::Result<DriverStatsChannelSet> LinuxDriverStatsFeed::copyChannels(
    const std::optional<std::string>& group, const std::optional<std::string>& subgroup) {
  DriverStatsChannelSet set{.group = group, .subgroup = subgroup};
  const ChannelReadings readings = read(set);
  if (readings.channels.empty() && readings.error != 0) return {.error = readings.error};
  for (const ChannelReading& reading : readings.channels) set.channels.push_back(reading.description);
  return {.value = std::move(set)};
}

DriverStatsFeed::Subscribed LinuxDriverStatsFeed::createSubscription(const DriverStatsChannelSet& channels) {
  return {.subscription = std::make_unique<Subscription>(channels), .subscribed_channels = channels};
}

DriverStatsFeed::Result<DriverStatsFeed::SampleSetPointer> LinuxDriverStatsFeed::createSamples(
    const DriverStatsSubscription& subscription) {
  const auto* own = dynamic_cast<const Subscription*>(&subscription);
  if (!own) return {.error = EINVAL};
  ChannelReadings readings = read(own->wanted());
  if (readings.channels.empty() && readings.error != 0) return {.error = readings.error};
  return {.value = std::make_unique<SampleSet>(std::move(readings.channels))};
}

DriverStatsFeed::Result<std::vector<DriverStatsChannel>> LinuxDriverStatsFeed::createSamplesDelta(
    const DriverStatsSampleSet* before, const DriverStatsSampleSet& after) {
  const auto* first = dynamic_cast<const SampleSet*>(before);
  const auto* latest = dynamic_cast<const SampleSet*>(&after);
  if (!first || !latest) return {.error = EINVAL};
  std::vector<DriverStatsChannel> channels;
  const auto& readings = latest->readings();
  for (std::size_t i = 0; i < readings.size(); ++i) {
    auto channel = channelBetween(first->find(readings[i].description, i), readings[i]);
    if (channel) channels.push_back(std::move(*channel));
  }
  return {.value = std::move(channels)};
}

ChannelReadings LinuxDriverStatsFeed::read(const DriverStatsChannelSet& wanted) {
  ChannelReadings readings;
  hardware_.read(wanted, readings);
  for (const DropInChannel& channel : dropIns()) {
    if (isWanted(wanted, channel.description.group, channel.description.subgroup)) {
      readDropIn(channel, readings);
    }
  }
  return readings;
}

// A channel whose file is missing or bad is left out until it is good; said once
// for each time that it turns bad.
void LinuxDriverStatsFeed::readDropIn(const DropInChannel& channel, ChannelReadings& readings) {
  const HostFiles::Content content = files_.read(channel.file);
  if (content.ok() && parseInto(readings, channel, content.text)) {
    complained_about_.erase(&channel);
    return;
  }
  if (!complained_about_.insert(&channel).second) return;
  const std::string reason =
      content.ok() ? "is not of its format" : std::generic_category().message(content.error);
  TAL_LOG(log_, "driver statistics channel ", *channel.description.channel_name,
          " is left out: ", channel.file, ": ", reason);
}

const std::vector<DropInChannel>& LinuxDriverStatsFeed::dropIns() {
  if (!drop_ins_) drop_ins_ = loadDropIns(drop_in_directory_, log_);
  return *drop_ins_;
}

}  // namespace tal
