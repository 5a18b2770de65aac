// The clock and the process table against what the kernel says by other means.

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/sysinfo.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <limits>

#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/process/LinuxProcessTable.h"

namespace tal {
namespace {

TEST(LinuxClockTest, ReadingsAreInTheirUnits) {
  constexpr double kSlackSeconds = 5;
  const LinuxClock clock;
  const TimeReading reading = clock.read();
  EXPECT_NEAR(reading.seconds_since_1970, static_cast<double>(std::time(nullptr)), kSlackSeconds);
  EXPECT_NEAR(clock.secondsSince1970(), reading.seconds_since_1970, kSlackSeconds);
  struct sysinfo info {};
  ASSERT_EQ(::sysinfo(&info), 0);
  EXPECT_NEAR(reading.uptime_seconds, static_cast<double>(info.uptime), kSlackSeconds);
}

TEST(LinuxClockTest, ProcessorTicksGrowWithWorkDone) {
  const LinuxClock clock;
  const std::int64_t before = clock.read().processor_ticks;
  while (clock.read().processor_ticks == before) {
  }
  EXPECT_GT(clock.read().processor_ticks, before);
}

TEST(LinuxClockTest, MonotonicTimeNeverGoesBackAndTheCoarseOneFollowsIt) {
  const LinuxClock clock;
  Clock::Instant last = clock.monotonic();
  for (int i = 0; i < 1000; ++i) {
    const Clock::Instant now = clock.monotonic();
    ASSERT_GE(now, last);
    last = now;
  }
  EXPECT_LE(LinuxClock::coarse(), clock.monotonic());
}

TEST(LinuxProcessTableTest, KnowsTheNameThatAProcessGaveItself) {
  std::string before(16, '\0');
  ASSERT_EQ(::prctl(PR_GET_NAME, before.data()), 0);
  ASSERT_EQ(::prctl(PR_SET_NAME, "odd (name) x"), 0);
  const LinuxProcessTable table;
  EXPECT_EQ(table.processName(table.ownProcessIdentifier()), "odd (name) x");
  ::prctl(PR_SET_NAME, before.data());
}

TEST(LinuxProcessTableTest, KnowsNothingOfProcessesThatAreNot) {
  const pid_t child = ::fork();
  if (child == 0) ::_exit(0);
  ASSERT_EQ(::waitpid(child, nullptr, 0), child);
  const LinuxProcessTable table;
  for (const std::int32_t gone :
       {static_cast<std::int32_t>(child), 0, -1, std::numeric_limits<std::int32_t>::max()}) {
    EXPECT_EQ(table.processName(gone), std::nullopt) << gone;
  }
}

}  // namespace
}  // namespace tal
