#pragma once

// Driver statistics from /proc, sysfs, and whatever drop-in files name.

#include <filesystem>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "core/Log.h"
#include "platform/DriverStatsFeed.h"
#include "platform/linux/driver_stats/DropInFile.h"
#include "platform/linux/driver_stats/HostFiles.h"
#include "platform/linux/driver_stats/SoundHardware.h"

namespace tal {

/// Lives on the reporting queue. What is read, and how a driver's own counters are
/// brought in, stands in docs/drvstats.md. Error codes are errno's. Drop-in files are
/// read when channels are first asked for, and then no more.
class LinuxDriverStatsFeed final : public DriverStatsFeed {
 public:
  struct Options {
    std::filesystem::path config_directory;
    /// `log` outlives the feed.
    const LogChannel& log;
    /// Another root than "/" serves tests and recorded machines.
    std::filesystem::path root = "/";
    unsigned kernel_long_bits = 8 * sizeof(long);
  };

  explicit LinuxDriverStatsFeed(Options options);

  Result<DriverStatsChannelSet> copyChannels(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subgroup) override;
  Subscribed createSubscription(const DriverStatsChannelSet& channels) override;
  Result<SampleSetPointer> createSamples(const DriverStatsSubscription& subscription) override;
  Result<std::vector<DriverStatsChannel>> createSamplesDelta(const DriverStatsSampleSet* before,
                                                             const DriverStatsSampleSet& after) override;

 private:
  ChannelReadings read(const DriverStatsChannelSet& wanted);
  void readDropIn(const DropInChannel& channel, ChannelReadings& readings);
  const std::vector<DropInChannel>& dropIns();

  const std::filesystem::path drop_in_directory_;
  const LogChannel& log_;
  const HostFiles files_;
  SoundHardware hardware_;
  std::optional<std::vector<DropInChannel>> drop_ins_;
  std::set<const DropInChannel*> complained_about_;  // of those above
};

}  // namespace tal
