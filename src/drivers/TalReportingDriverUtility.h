#pragma once

// Samples the audio drivers' statistics at a session's start and stop, and sends
// what happened in between into the session.

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/Log.h"
#include "core/MessageDict.h"
#include "drivers/TalReportingDriver.h"
#include "platform/DriverStatsFeed.h"
#include "session/TalReportingSession.h"

namespace tal {

/// Lives on the reporting queue; shared by all sessions of the process. The
/// drivers' channels are looked up once, at construction: a driver that has none
/// then is never sampled.
class TalReportingDriverUtility {
 public:
  /// By driver description.
  using SnapShot = std::map<std::string, DriverStatsFeed::SampleSetPointer>;

  /// Both outlive the utility.
  TalReportingDriverUtility(DriverStatsFeed& feed, const LogChannel& log);

  /// A driver that cannot be sampled is left out.
  SnapShot getSnapShot();

  /// Sends up to three messages of category Drvstats, one for each format of
  /// channel, with an entry for each channel that had something to tell since the
  /// snapshot. Without a snapshot the drivers are sampled and nothing is sent.
  void sendDriverLogsForSession(TalReportingSession& session, const SnapShot* driver_snap_shot);

  // Each adds the channel's entry to the dictionary, replacing one of the same key.

  /// The value, unless it is below 1.
  void processSimpleData(const DriverStatsChannel& channel, MessageDict& driver_stats) const;
  /// "name:…,transition:…,residency:…,duty_cycle:…;" of every state that was
  /// resided in; the entry is there even when none was.
  void processStateData(const DriverStatsChannel& channel, MessageDict& driver_stats) const;
  /// "count=…,lower=…,upper=…,min=…,max=…,unit=…::" and "lower-upper:hits" of every
  /// bucket that was hit, separated by ";". Nothing when none was. The bounds in
  /// front include 0, hit or not: readers rely on it.
  void processHistogramData(const DriverStatsChannel& channel, MessageDict& driver_stats) const;

  /// "driver_group_subgroup_type_channel" without the absent parts. Blanks and
  /// underscores are taken out of the parts, so that "_" separates and nothing
  /// else; what follows a "<" in a driver's name is not part of it.
  static std::string getDriverStatsKey(const DriverStatsChannel& channel, std::string_view type);

  const std::vector<TalReportingIOChannelSubscription>& ioChannelSubscriptions() const {
    return io_channel_subscriptions_;
  }

 private:
  struct DriverStats {
    MessageDict simple;
    MessageDict histogram;
    MessageDict state;
  };

  void subscribe(TalReportingDriver driver);
  /// What there is, if anything; an error has been logged.
  template <typename Value>
  std::optional<Value> checked(DriverStatsFeed::Result<Value> result) const;
  void collect(const TalReportingIOChannelSubscription& subscription, const SnapShot* driver_snap_shot,
               DriverStats& stats);
  void process(const DriverStatsChannel& channel, DriverStats& stats) const;

  DriverStatsFeed& feed_;
  const LogChannel& log_;
  std::vector<TalReportingIOChannelSubscription> io_channel_subscriptions_;
};

}  // namespace tal
