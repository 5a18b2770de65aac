#include <gtest/gtest.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/system_state/LinuxSystemState.h"
#include "support/HandDriven.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

class SystemStateOfTree : public ::testing::Test {
 protected:
  void write(const std::string& path, const std::string& text) { test::writeFile(root.path() / path, text); }
  // Readings are kept for a second.
  void change(const std::string& path, const std::string& text) {
    write(path, text);
    clock.advance(1s);
  }

  test::TemporaryDirectory root;
  test::HandClock clock;
  LinuxSystemState state{clock, root.path()};
};

TEST_F(SystemStateOfTree, WorstZoneDecidesTheThermalState) {
  EXPECT_EQ(state.thermalState(), 0) << "no zones at all";
  const auto zone = [this](int number, const std::string& temperature) {
    const std::string path = "sys/class/thermal/thermal_zone" + std::to_string(number) + "/";
    const std::vector<std::pair<std::string, std::string>> trips{{"critical", "100000"},
                                                                 {"hot", "90000"},
                                                                 {"passive", "80000"},
                                                                 {"active", "70000"},
                                                                 {"critical", "0"}};
    for (std::size_t i = 0; i < trips.size(); ++i) {
      change(path + "trip_point_" + std::to_string(i) + "_type", trips[i].first + "\n");
      change(path + "trip_point_" + std::to_string(i) + "_temp", trips[i].second + "\n");
    }
    change(path + "temp", temperature + "\n");
  };
  zone(0, "20000");
  const std::vector<std::pair<std::string, int>> rows{
      {"69999", 0}, {"70000", 1}, {"89999", 1}, {"90000", 2}, {"99999", 2}, {"100000", 3}, {"nonsense", 0}};
  for (const auto& [temperature, expected] : rows) {
    zone(1, temperature);
    EXPECT_EQ(state.thermalState(), expected) << temperature;
  }
}

TEST_F(SystemStateOfTree, LowPowerIsAProfileOrABatterySaver) {
  EXPECT_FALSE(state.lowPowerModeIsOn());
  change("sys/firmware/acpi/platform_profile", "balanced\n");
  EXPECT_FALSE(state.lowPowerModeIsOn());
  change("sys/module/battery_saver/parameters/enabled", "Y\n");
  EXPECT_TRUE(state.lowPowerModeIsOn());
  change("sys/module/battery_saver/parameters/enabled", "N\n");
  change("sys/firmware/acpi/platform_profile", "low-power\n");
  EXPECT_TRUE(state.lowPowerModeIsOn());
}

TEST_F(SystemStateOfTree, FootprintIsTheProportionalSetElseTheResidentAskedOnceASecond) {
  EXPECT_FALSE(state.physicalFootprint().error.empty());
  clock.advance(1s);
  write("proc/self/statm", "1000 300 200 1 0 100 0\n");
  EXPECT_EQ(state.physicalFootprint().bytes, 300U * static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE)));
  write("proc/self/smaps_rollup", "55d0-7ffd ---p 00000000 00:00 0 [rollup]\nRss: 9000 kB\nPss: 5000 kB\n");
  clock.advance(999ms);
  EXPECT_NE(state.physicalFootprint().bytes, 5000U * 1024);
  clock.advance(1ms);
  EXPECT_EQ(state.physicalFootprint().bytes, 5000U * 1024);
}

TEST_F(SystemStateOfTree, LoadAverages) {
  EXPECT_EQ(state.loadAverages(), (std::array<double, 3>{0, 0, 0}));
  change("proc/loadavg", "0.52 0.58 1.59 1/597 12345\n");
  EXPECT_EQ(state.loadAverages(), (std::array<double, 3>{0.52, 0.58, 1.59}));
  write("proc/loadavg", "9.00 9.00 9.00 1/597 12345\n");
  EXPECT_EQ(state.loadAverages()[0], 0.52) << "asked once a second";
}

TEST(LinuxSystemState, OfThisMachineAnswers) {
  const test::HandClock clock;
  const LinuxSystemState state(clock);
  EXPECT_GT(state.physicalFootprint().bytes.value_or(0), 0U);
}

}  // namespace
}  // namespace tal
