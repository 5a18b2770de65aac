#include "platform/linux/capture/ProcStat.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>

namespace tal {

namespace {

// Numbers of fields, as proc(5) counts them; the third is the first behind the name.
enum Field : std::size_t {
  kState = 3,
  kParent = 4,
  kUserTicks = 14,
  kSystemTicks = 15,
  kNice = 19,
  kThreads = 20,
  kResidentPages = 24,
  kProcessor = 39,
  kRealtimePriority = 40,
  kPolicy = 41,
  kFields = 42
};

long numberOf(std::string_view text) {
  long number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

}  // namespace

std::optional<ProcStat> parseProcStat(std::string_view text) {
  // The name may hold blanks and brackets of its own.
  const std::size_t open = text.find('(');
  const std::size_t close = text.rfind(')');
  if (open == std::string_view::npos || close == std::string_view::npos || close < open) return std::nullopt;
  ProcStat stat;
  stat.name = text.substr(open + 1, close - open - 1);
  std::string_view rest = text.substr(close + 1);
  std::array<std::string_view, kFields> fields{};
  for (std::size_t i = kState; i < kFields; ++i) {
    rest.remove_prefix(std::min(rest.find_first_not_of(" \n"), rest.size()));
    fields[i] = rest.substr(0, rest.find_first_of(" \n"));
    rest.remove_prefix(fields[i].size());
  }
  if (fields[kState].empty()) return std::nullopt;
  static const double kTicksPerSecond = static_cast<double>(::sysconf(_SC_CLK_TCK));
  static const long kPageBytes = ::sysconf(_SC_PAGESIZE);
  stat.state = fields[kState].front();
  stat.parent = numberOf(fields[kParent]);
  stat.cpu_seconds =
      static_cast<double>(numberOf(fields[kUserTicks]) + numberOf(fields[kSystemTicks])) / kTicksPerSecond;
  stat.nice = numberOf(fields[kNice]);
  stat.threads = numberOf(fields[kThreads]);
  stat.resident_bytes =
      static_cast<std::uint64_t>(std::max(0L, numberOf(fields[kResidentPages])) * kPageBytes);
  stat.last_processor = numberOf(fields[kProcessor]);
  stat.realtime_priority = numberOf(fields[kRealtimePriority]);
  stat.policy = numberOf(fields[kPolicy]);
  return stat;
}

std::string schedulingPolicyName(long policy) {
  constexpr std::array<std::string_view, 7> kNames{"other", "fifo", "rr", "batch", "", "idle", "deadline"};
  const auto index = static_cast<std::size_t>(policy);
  if (index < kNames.size() && !kNames[index].empty()) return std::string(kNames[index]);
  return std::to_string(policy);
}

std::vector<std::int32_t> numbersIn(int directory, const char* path) {
  std::vector<std::int32_t> numbers;
  const int own = ::openat(directory, path, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* stream = own < 0 ? nullptr : ::fdopendir(own);
  if (!stream) {
    if (own >= 0) ::close(own);
    return numbers;
  }
  while (const dirent* entry = ::readdir(stream)) {
    const std::string_view name = entry->d_name;
    std::int32_t number = 0;
    const auto [end, error] = std::from_chars(name.data(), name.data() + name.size(), number);
    if (error == std::errc() && end == name.data() + name.size()) numbers.push_back(number);
  }
  ::closedir(stream);
  std::sort(numbers.begin(), numbers.end());
  return numbers;
}

}  // namespace tal
