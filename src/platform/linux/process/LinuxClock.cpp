#include "platform/linux/process/LinuxClock.h"

#include <ctime>
#include <thread>

namespace tal {

static_assert(CLOCKS_PER_SEC == 1'000'000, "TimeReading counts processor time in microseconds");

namespace {

Clock::Instant nanosecondsOf(clockid_t clock) {
  timespec time{};
  clock_gettime(clock, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

double secondsOf(clockid_t clock) {
  constexpr double kSecondsPerNanosecond = 1e-9;
  timespec time{};
  clock_gettime(clock, &time);
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * kSecondsPerNanosecond;
}

}  // namespace

double LinuxClock::secondsSince1970() const { return secondsOf(CLOCK_REALTIME); }

Clock::Instant LinuxClock::monotonic() const { return nanosecondsOf(CLOCK_MONOTONIC); }

Clock::Instant LinuxClock::coarse() { return nanosecondsOf(CLOCK_MONOTONIC_COARSE); }

TimeReading LinuxClock::read() const {
  return {.seconds_since_1970 = secondsOf(CLOCK_REALTIME),
          .uptime_seconds = secondsOf(CLOCK_BOOTTIME),
          .processor_ticks = static_cast<std::int64_t>(std::clock())};
}

std::string LinuxClock::localTimeForFileName() const {
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  char text[32];
  return {text, std::strftime(text, sizeof text, "%Y%m%d-%H%M%S%z", &local)};
}

void LinuxClock::sleepFor(std::chrono::nanoseconds duration) const { std::this_thread::sleep_for(duration); }

}  // namespace tal
