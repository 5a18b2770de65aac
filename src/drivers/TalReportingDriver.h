#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/DriverStatsFeed.h"

namespace tal {

/// A driver, or a kind of them, as the feed knows it: its channels bear this
/// group and subgroup. An absent one stands for any.
struct TalReportingDriver {
  std::optional<std::string> group_name;
  std::optional<std::string> sub_group_name;

  static TalReportingDriver driverWithGroupName(std::optional<std::string> group_name,
                                                std::optional<std::string> sub_group_name) {
    return {std::move(group_name), std::move(sub_group_name)};
  }

  /// "group-subgroup", with "(null)" for an absent part.
  std::string description() const {
    return group_name.value_or("(null)") + '-' + sub_group_name.value_or("(null)");
  }
};

/// A driver whose channels are sampled.
struct TalReportingIOChannelSubscription {
  TalReportingDriver driver;
  std::unique_ptr<DriverStatsSubscription> subscription = nullptr;
  DriverStatsChannelSet subscribed_channels = {};
};

}  // namespace tal
