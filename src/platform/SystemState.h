#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

namespace tal {

/// How the device and this process are doing at the moment. Called on the
/// reporting queue at a session's stop: each reading must be quick (it may be a
/// second old), and a source that is missing reads as the least alarming state.
class SystemState {
 public:
  /// The process's memory, or why it could not be asked for.
  struct Footprint {
    std::optional<std::uint64_t> bytes;
    std::string error;
  };

  virtual ~SystemState() = default;

  /// 0 nominal, 1 fair, 2 serious, 3 critical.
  virtual int thermalState() const = 0;
  virtual bool lowPowerModeIsOn() const = 0;
  /// Physical memory that this process is charged for.
  virtual Footprint physicalFootprint() const = 0;
  /// Over 1, 5 and 15 minutes; zeros when unknown.
  virtual std::array<double, 3> loadAverages() const = 0;
};

}  // namespace tal
