#pragma once

// What a stock kernel tells of sound hardware, as channels.

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/driver_stats/ChannelReading.h"
#include "platform/linux/driver_stats/HostFiles.h"
#include "platform/linux/driver_stats/SoundCards.h"

namespace tal {

/// Lives on the reporting queue. For each card of /proc/asound/cards, whose driver
/// is the channels' driver name:
///
/// - group "Tx" and "Rx": of each playback and capture substream the frames moved,
///   and the largest room or fill of its buffer;
/// - subgroup "MCA": the interrupts of the card's own lines;
/// - group "StateTransitionTimes_ms": how long the card's device and its codecs were
///   active and suspended.
///
/// A channel whose source the kernel does not have does not exist.
class SoundHardware {
 public:
  /// `files` outlives this. `kernel_long_bits`: the size of the kernel's long.
  SoundHardware(const HostFiles& files, unsigned kernel_long_bits)
      : files_(files), kernel_long_bits_(kernel_long_bits) {}

  void read(const DriverStatsChannelSet& wanted, ChannelReadings& readings);

 private:
  using Peaks = std::map<std::string, std::shared_ptr<PeakHistory>>;
  struct Direction {
    std::string_view group;
    char suffix;  // of the directories of the direction's devices: "pcm0p", "pcm0c"
    std::string_view peak_name;
    Peaks peaks = {};  // by the name of the substream
  };

  void readSubstreams(const std::vector<SoundCard>& cards, Direction& direction, ChannelReadings& readings);
  void readDevice(const SoundCard& card, const std::string& device, const Direction& direction, Peaks& peaks,
                  ChannelReadings& readings) const;
  void addSubstream(const SoundCard& card, const std::string& name, const PcmReading& reading,
                    const Direction& direction, Peaks& peaks, ChannelReadings& readings) const;
  /// Nothing where there is no such substream.
  std::optional<PcmReading> readStatus(const std::string& directory, ChannelReadings& readings) const;
  void readInterrupts(const std::vector<SoundCard>& cards, ChannelReadings& readings) const;
  std::vector<std::uint32_t> interruptLinesOf(const SoundCard& card) const;
  void readPowerTimes(const std::vector<SoundCard>& cards, ChannelReadings& readings) const;
  std::vector<std::string> devicesOf(const SoundCard& card,
                                     const std::vector<std::string>& sound_class) const;
  std::optional<StateReading> readPowerTimesOf(const std::string& device) const;
  std::optional<std::uint64_t> readNumber(const std::string& path) const;

  const HostFiles& files_;
  const unsigned kernel_long_bits_;
  std::uint64_t reading_number_ = 0;
  Direction capture_{"Rx", 'c', "Largest Fill"};
  Direction playback_{"Tx", 'p', "Largest Room"};
};

}  // namespace tal
