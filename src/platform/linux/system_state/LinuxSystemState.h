#pragma once

// The state of the device from sysfs, and of this process from /proc.

#include <filesystem>
#include <optional>

#include "platform/Clock.h"
#include "platform/SystemState.h"

namespace tal {

/// Lives on the reporting queue. Reads, below the root:
///
/// - sys/class/thermal/thermal_zone*: a zone is fair from its lowest "active" or
///   "passive" trip point on, serious from "hot", critical from "critical"; the
///   worst zone counts. Trip points of 0 or below are ones that a driver left
///   unset.
/// - sys/firmware/acpi/platform_profile: "low-power" is low-power mode;
///   sys/module/battery_saver/parameters/enabled: so is "Y" or "1" there.
/// - proc/self/smaps_rollup: the proportional set size; where the kernel has none,
///   the resident set of proc/self/statm.
/// - proc/loadavg.
///
/// Each is read at most once a second: many sessions stop at once when a client
/// ends, and the footprint makes the kernel walk all of the process's memory.
class LinuxSystemState final : public SystemState {
 public:
  /// `clock` outlives this. Another root than "/" serves a test.
  explicit LinuxSystemState(const Clock& clock, std::filesystem::path root = "/");

  int thermalState() const override;
  bool lowPowerModeIsOn() const override;
  Footprint physicalFootprint() const override;
  std::array<double, 3> loadAverages() const override;

 private:
  template <typename Value>
  struct Reading {
    Value value{};
    std::optional<Clock::Instant> time;
  };
  template <typename Value>
  const Value& recent(Reading<Value>& reading, Value (LinuxSystemState::*read)() const) const;

  int readThermalState() const;
  bool readLowPowerMode() const;
  Footprint measureFootprint() const;
  std::array<double, 3> readLoadAverages() const;

  const Clock& clock_;
  const std::filesystem::path root_;
  mutable Reading<int> thermal_state_;
  mutable Reading<bool> low_power_mode_;
  mutable Reading<Footprint> footprint_;
  mutable Reading<std::array<double, 3>> load_averages_;
};

}  // namespace tal
