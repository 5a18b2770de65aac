#pragma once

#include <optional>
#include <variant>
#include <vector>

#include "platform/DriverStatsFeed.h"
#include "platform/linux/driver_stats/CounterReadings.h"
#include "platform/linux/driver_stats/InterruptReading.h"
#include "platform/linux/driver_stats/PcmReading.h"

namespace tal {

/// What one channel's source said at one moment.
struct ChannelReading {
  DriverStatsDescription description;
  std::variant<PcmReading, PeakReading, InterruptReading, SimpleReading, StateReading, HistogramReading>
      values;
};

/// What was read, and the first errno where something that is there could not be.
struct ChannelReadings {
  std::vector<ChannelReading> channels = {};
  int error = 0;
};

/// The channel's values from one reading to the next. A substream that was not
/// there `before` is new and counts from 0; of any other channel nothing can be told
/// then.
std::optional<DriverStatsChannel> channelBetween(const ChannelReading* before, const ChannelReading& after);

/// True when a group and subgroup are among those asked for: an absent one stands for any.
bool isWanted(const DriverStatsChannelSet& wanted, const std::optional<std::string>& group,
              const std::optional<std::string>& subgroup);

}  // namespace tal
