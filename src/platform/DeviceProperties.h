#pragma once

#include <optional>
#include <string_view>

namespace tal {

/// What kind of device this is. Any thread.
class DeviceProperties {
 public:
  virtual ~DeviceProperties() = default;

  /// The property, or nothing when the device does not state it.
  virtual std::optional<bool> booleanProperty(std::string_view name) const = 0;
};

/// True when the device states "InternalBuild". Asked once per process; the
/// answer is kept in `Platform::internal_build`.
inline bool TalReportingUtilityIsInternalBuild(const DeviceProperties& properties) {
  return properties.booleanProperty("InternalBuild").value_or(false);
}

}  // namespace tal
