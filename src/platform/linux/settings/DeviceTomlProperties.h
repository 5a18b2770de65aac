#pragma once

#include <filesystem>
#include <mutex>
#include <set>
#include <string>

#include "core/Log.h"
#include "platform/DeviceProperties.h"
#include "platform/linux/settings/TomlFile.h"

namespace tal {

/// Device properties from `device.toml`, read anew when the file has changed.
/// Any thread. A property that is no boolean is logged once, and absent.
class DeviceTomlProperties final : public DeviceProperties {
 public:
  /// `log` outlives the object. The file need not exist.
  DeviceTomlProperties(const std::filesystem::path& config_directory, const LogChannel& log)
      : log_(log), file_(config_directory / "device.toml", log) {}

  std::optional<bool> booleanProperty(std::string_view name) const override;

 private:
  const LogChannel& log_;
  mutable std::mutex mutex_;
  mutable TomlFile file_;
  mutable std::set<std::string, std::less<>> complained_about_;
};

}  // namespace tal
