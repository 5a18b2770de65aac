#include "platform/linux/driver_stats/ChannelReading.h"

namespace tal {

namespace {

// Each says whether there is anything to tell.

bool fill(const PcmReading* before, const PcmReading& after, DriverStatsChannel& channel) {
  channel.integer_value = static_cast<std::int64_t>(pcmFramesMoved(before, after));
  return true;
}

bool fill(const PeakReading* before, const PeakReading& after, DriverStatsChannel& channel) {
  const std::uint64_t begin = before ? before->number : 0;
  channel.integer_value = static_cast<std::int64_t>(after.history->largest(begin, after.number));
  return true;
}

bool fill(const InterruptReading* before, const InterruptReading& after, DriverStatsChannel& channel) {
  const auto interrupts = before ? interruptsBetween(*before, after) : std::nullopt;
  channel.integer_value = static_cast<std::int64_t>(interrupts.value_or(0));
  return interrupts.has_value();
}

template <typename Reading>
bool fill(const Reading* before, const Reading& after, DriverStatsChannel& channel) {
  if (before) fillDelta(*before, after, channel);
  return before != nullptr;
}

}  // namespace

std::optional<DriverStatsChannel> channelBetween(const ChannelReading* before, const ChannelReading& after) {
  DriverStatsChannel channel{.description = after.description};
  const bool told = std::visit(
      [&]<typename Reading>(const Reading& latest) {
        return fill(before ? std::get_if<Reading>(&before->values) : nullptr, latest, channel);
      },
      after.values);
  return told ? std::optional(std::move(channel)) : std::nullopt;
}

bool isWanted(const DriverStatsChannelSet& wanted, const std::optional<std::string>& group,
              const std::optional<std::string>& subgroup) {
  return (!wanted.group || wanted.group == group) && (!wanted.subgroup || wanted.subgroup == subgroup);
}

}  // namespace tal
