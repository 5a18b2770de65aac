#include "platform/linux/system_state/LinuxSystemState.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <string_view>
#include <system_error>

namespace tal {

namespace {

namespace fs = std::filesystem;

enum Thermal : int { kNominal = 0, kFair = 1, kSerious = 2, kCritical = 3 };

constexpr auto kReadingAge = std::chrono::seconds(1);
// The kernel numbers trip points without gaps, and no driver has more.
constexpr int kMostTripPoints = 64;

// The first line of the file, or nothing.
std::optional<std::string> readLine(const fs::path& path) {
  std::ifstream file(path);
  std::string line;
  if (!std::getline(file, line)) return std::nullopt;
  return line;
}

std::optional<long> readNumber(const fs::path& path) {
  const auto line = readLine(path);
  if (!line) return std::nullopt;
  std::istringstream text(*line);
  long number = 0;
  if (!(text >> number)) return std::nullopt;
  return number;
}

Thermal stateAt(std::string_view trip_type) {
  if (trip_type == "critical") return kCritical;
  if (trip_type == "hot") return kSerious;
  return trip_type == "passive" || trip_type == "active" ? kFair : kNominal;
}

Thermal zoneState(const fs::path& zone) {
  const auto temperature = readNumber(zone / "temp");
  if (!temperature) return kNominal;
  Thermal worst = kNominal;
  for (int i = 0; i < kMostTripPoints; ++i) {
    const std::string trip = "trip_point_" + std::to_string(i);
    const auto type = readLine(zone / (trip + "_type"));
    if (!type) break;
    const auto limit = readNumber(zone / (trip + "_temp"));
    if (limit && *limit > 0 && *temperature >= *limit) worst = std::max(worst, stateAt(*type));
  }
  return worst;
}

}  // namespace

LinuxSystemState::LinuxSystemState(const Clock& clock, fs::path root)
    : clock_(clock), root_(std::move(root)) {}

template <typename Value>
const Value& LinuxSystemState::recent(Reading<Value>& reading,
                                      Value (LinuxSystemState::*read)() const) const {
  const auto now = clock_.monotonic();
  if (!reading.time || now - *reading.time >= kReadingAge) reading = {(this->*read)(), now};
  return reading.value;
}

int LinuxSystemState::thermalState() const {
  return recent(thermal_state_, &LinuxSystemState::readThermalState);
}

bool LinuxSystemState::lowPowerModeIsOn() const {
  return recent(low_power_mode_, &LinuxSystemState::readLowPowerMode);
}

SystemState::Footprint LinuxSystemState::physicalFootprint() const {
  return recent(footprint_, &LinuxSystemState::measureFootprint);
}

std::array<double, 3> LinuxSystemState::loadAverages() const {
  return recent(load_averages_, &LinuxSystemState::readLoadAverages);
}

int LinuxSystemState::readThermalState() const {
  Thermal worst = kNominal;
  std::error_code missing;
  for (const auto& entry : fs::directory_iterator(root_ / "sys/class/thermal", missing)) {
    if (!entry.path().filename().string().starts_with("thermal_zone")) continue;
    worst = std::max(worst, zoneState(entry.path()));
  }
  return worst;
}

bool LinuxSystemState::readLowPowerMode() const {
  const auto profile = readLine(root_ / "sys/firmware/acpi/platform_profile");
  const auto saver = readLine(root_ / "sys/module/battery_saver/parameters/enabled");
  return profile == "low-power" || saver == "Y" || saver == "1";
}

SystemState::Footprint LinuxSystemState::measureFootprint() const {
  constexpr std::uint64_t kKibibyte = 1024;
  std::ifstream rollup(root_ / "proc/self/smaps_rollup");
  std::string word;
  std::uint64_t number = 0;
  while (rollup >> word) {
    if (word == "Pss:" && rollup >> number) return {number * kKibibyte, ""};
  }
  errno = 0;
  std::ifstream statm(root_ / "proc/self/statm");
  const int error = errno;
  std::uint64_t resident_pages = 0;
  if (statm >> number >> resident_pages) {
    return {resident_pages * static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE)), ""};
  }
  return {std::nullopt, error == 0 ? "unreadable" : std::generic_category().message(error)};
}

std::array<double, 3> LinuxSystemState::readLoadAverages() const {
  std::ifstream file(root_ / "proc/loadavg");
  std::array<double, 3> averages{};
  for (double& average : averages) file >> average;
  return averages;
}

}  // namespace tal
