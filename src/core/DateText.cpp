#include "core/DateText.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>

namespace tal {

void appendRfc3339(std::string& out, double seconds_since_1970) {
  using namespace std::chrono;
  constexpr double kYear0 = -62167219200.0;
  constexpr double kLastSecondOfYear9999 = 253402300799.0;
  constexpr double kMicrosecondsPerSecond = 1e6;
  const double held =
      std::isnan(seconds_since_1970) ? 0 : std::clamp(seconds_since_1970, kYear0, kLastSecondOfYear9999);
  const auto total = microseconds(static_cast<std::int64_t>(std::llround(held * kMicrosecondsPerSecond)));
  const auto day = floor<days>(sys_time<microseconds>(total));
  const year_month_day date(day);
  const hh_mm_ss<microseconds> time(total - day.time_since_epoch());

  char text[48];
  const int length = std::snprintf(
      text, sizeof text, "%04d-%02u-%02uT%02ld:%02ld:%02ld.%06ldZ", static_cast<int>(date.year()),
      static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
      static_cast<long>(time.hours().count()), static_cast<long>(time.minutes().count()),
      static_cast<long>(time.seconds().count()), static_cast<long>(time.subseconds().count()));
  out.append(text, static_cast<std::size_t>(length));
}

}  // namespace tal
