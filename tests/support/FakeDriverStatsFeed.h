#pragma once

// Drivers whose counters a test sets by hand.

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/DriverStatsFeed.h"

namespace tal::test {

/// Has the channels that a test gives to a driver, "group-subgroup" with "*" for
/// any, and fails where it is told to. A difference subtracts integers,
/// residencies and hits, each from its predecessor at the same place.
class FakeDriverStatsFeed final : public DriverStatsFeed {
 public:
  struct Driver {
    std::vector<DriverStatsChannel> channels = {};  ///< as they are read now
    std::optional<long> channels_error = {};
    std::optional<long> subscription_error = {};
    std::optional<long> samples_error = {};
    bool samples_are_missing = false;  // without an error to go with it
    bool delta_fails = false;
  };
  static constexpr long kNoSamplesError = 22;
  static constexpr long kDeltaError = 33;

  Result<DriverStatsChannelSet> copyChannels(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subgroup) override {
    asked.push_back(group.value_or("*") + '-' + subgroup.value_or("*"));
    const Driver& driver = drivers[asked.back()];
    if (driver.channels_error) return {.error = driver.channels_error};
    DriverStatsChannelSet set{.group = group, .subgroup = subgroup};
    for (const auto& channel : driver.channels) set.channels.push_back(channel.description);
    return {.value = std::move(set)};
  }
  Subscribed createSubscription(const DriverStatsChannelSet& channels) override {
    const std::string name = channels.group.value_or("*") + '-' + channels.subgroup.value_or("*");
    if (const auto error = drivers[name].subscription_error) return {.error = *error};
    return {.subscription = std::make_unique<Subscription>(name), .subscribed_channels = channels};
  }
  Result<SampleSetPointer> createSamples(const DriverStatsSubscription& subscription) override {
    const std::string& name = dynamic_cast<const Subscription&>(subscription).name;
    sampled.push_back(name);
    const Driver& driver = drivers[name];
    if (driver.samples_error) return {.error = driver.samples_error};
    if (driver.samples_are_missing) return {};
    return {.value = std::make_unique<Samples>(name, driver.channels)};
  }
  Result<std::vector<DriverStatsChannel>> createSamplesDelta(const DriverStatsSampleSet* before,
                                                             const DriverStatsSampleSet& after) override {
    if (!before) return {.error = kNoSamplesError};
    const auto& latest = dynamic_cast<const Samples&>(after);
    if (drivers[latest.name].delta_fails) return {.error = kDeltaError};
    std::vector<DriverStatsChannel> channels = latest.channels;
    const auto& first = dynamic_cast<const Samples&>(*before).channels;
    for (std::size_t i = 0; i < channels.size() && i < first.size(); ++i) subtract(first[i], channels[i]);
    return {.value = std::move(channels)};
  }

  std::map<std::string, Driver> drivers;
  std::vector<std::string> asked;    // for channels
  std::vector<std::string> sampled;  // drivers, in order

 private:
  struct Subscription final : DriverStatsSubscription {
    explicit Subscription(std::string driver) : name(std::move(driver)) {}
    std::string name;
  };
  struct Samples final : DriverStatsSampleSet {
    Samples(std::string driver, std::vector<DriverStatsChannel> read)
        : name(std::move(driver)), channels(std::move(read)) {}
    std::string name;
    std::vector<DriverStatsChannel> channels;
  };

  static void subtract(const DriverStatsChannel& first, DriverStatsChannel& channel) {
    channel.integer_value -= first.integer_value;
    for (std::size_t i = 0; i < channel.states.size() && i < first.states.size(); ++i) {
      channel.states[i].residency -= first.states[i].residency;
    }
    for (std::size_t i = 0; i < channel.buckets.size() && i < first.buckets.size(); ++i) {
      channel.buckets[i].hits -= first.buckets[i].hits;
    }
  }
};

}  // namespace tal::test
