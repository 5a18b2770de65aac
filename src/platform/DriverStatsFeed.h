#pragma once

// What the audio drivers count: the channels that they export, and readings of
// them at two moments, of which a feed makes the difference.

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace tal {

/// How a channel's values are laid out. Feeds may know more formats than these:
/// any other code can occur.
enum class DriverStatsFormat : std::uint8_t { kSimple = 1, kState = 2, kHistogram = 3 };

/// Which channel, in the words of its driver. What a driver does not name is absent.
struct DriverStatsDescription {
  DriverStatsFormat format = DriverStatsFormat::kSimple;
  std::optional<std::string> driver_name = {};
  std::optional<std::string> group = {};
  std::optional<std::string> subgroup = {};
  std::optional<std::string> channel_name = {};
  std::optional<std::string> unit_label = {};

  friend bool operator==(const DriverStatsDescription&, const DriverStatsDescription&) = default;
};

struct DriverStatsState {
  std::string name;
  std::uint64_t in_transition_count = 0;
  std::uint64_t residency = 0;  ///< in the unit of the channel
  double duty_cycle = 0;        ///< the state's part of all residencies, 0 to 1
};

struct DriverStatsBucket {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  std::int64_t hits = 0;
  int bounds_status = 0;  ///< not 0 when the bounds could not be read; they are 0 then
};

/// A channel with its values; which of them are filled follows from the format.
struct DriverStatsChannel {
  DriverStatsDescription description;
  std::int64_t integer_value = 0;
  std::vector<DriverStatsState> states = {};
  std::vector<DriverStatsBucket> buckets = {};
  std::int64_t minimum = 0;  ///< of the histogram
  std::int64_t maximum = 0;
};

/// The channels of a group at the moment when they were asked for.
struct DriverStatsChannelSet {
  std::optional<std::string> group = {};
  std::optional<std::string> subgroup = {};
  std::vector<DriverStatsDescription> channels = {};
};

/// What one reading found. Only the feed that made it can look inside.
class DriverStatsSampleSet {
 public:
  virtual ~DriverStatsSampleSet() = default;
};

/// A feed's handle of a subscription, valid as long as the feed.
class DriverStatsSubscription {
 public:
  virtual ~DriverStatsSubscription() = default;
};

/// The drivers' statistics. Called on the reporting queue when sessions start
/// and stop: a reading must take no more than a few milliseconds. Readings of
/// overlapping sessions do not disturb each other.
///
/// A subscription is to a group: hardware that comes later is in its readings,
/// hardware that has gone is not.
class DriverStatsFeed {
 public:
  /// The value; or an error code of the feed; or neither: the feed has none and
  /// nothing to say about it.
  template <typename Value>
  struct Result {
    std::optional<Value> value = std::nullopt;
    std::optional<long> error = std::nullopt;
  };
  using SampleSetPointer = std::unique_ptr<DriverStatsSampleSet>;
  struct Subscribed {
    std::unique_ptr<DriverStatsSubscription> subscription = nullptr;
    std::optional<DriverStatsChannelSet> subscribed_channels = std::nullopt;
    long error = 0;
  };

  virtual ~DriverStatsFeed() = default;

  /// An absent group or subgroup stands for any.
  virtual Result<DriverStatsChannelSet> copyChannels(const std::optional<std::string>& group,
                                                     const std::optional<std::string>& subgroup) = 0;
  virtual Subscribed createSubscription(const DriverStatsChannelSet& channels) = 0;
  virtual Result<SampleSetPointer> createSamples(const DriverStatsSubscription& subscription) = 0;
  /// What happened from `before` to `after`, two readings of one subscription: each
  /// channel once, in the feed's order. An error without a `before`.
  virtual Result<std::vector<DriverStatsChannel>> createSamplesDelta(const DriverStatsSampleSet* before,
                                                                     const DriverStatsSampleSet& after) = 0;
};

}  // namespace tal
