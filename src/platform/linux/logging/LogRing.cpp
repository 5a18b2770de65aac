#include "platform/linux/logging/LogRing.h"

#include <algorithm>
#include <chrono>

#include "platform/linux/logging/LogLine.h"

namespace tal {

void LogRing::write(std::string_view channel, LogLevel level, std::string_view line) {
  const double now =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  {
    const std::lock_guard lock(mutex_);
    Line& slot = lines_[count_++ % kLines];
    slot.seconds_since_1970 = now;
    slot.channel = channel;
    slot.level = level;
    slot.text.assign(line.substr(0, kMostLineBytes));
  }
  if (level <= next_most_detailed_) next_.write(channel, level, line);
}

std::string LogRing::text() const {
  constexpr std::uint64_t kLinesPerLock = 50;
  std::string out;
  std::vector<Line> some;
  std::uint64_t next = 0;
  std::uint64_t end = kLines;
  for (bool first = true; first || next < end; first = false) {
    {
      const std::lock_guard lock(mutex_);
      if (first) end = count_;
      const std::uint64_t oldest = count_ > kLines ? count_ - kLines : 0;
      next = std::max(next, oldest);
      const std::uint64_t until = std::min(end, next + kLinesPerLock);
      for (; next < until; ++next) some.push_back(lines_[next % kLines]);
    }
    for (const Line& line : some) {
      appendLogLine(out, line.seconds_since_1970, line.channel, line.level, line.text);
    }
    some.clear();
  }
  return out;
}

}  // namespace tal
