#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// What the "stat" file of a process or thread says.
struct ProcStat {
  std::string name;
  char state = '?';
  long parent = 0;
  double cpu_seconds = 0;
  long nice = 0;
  long threads = 0;
  std::uint64_t resident_bytes = 0;
  long last_processor = 0;
  long realtime_priority = 0;  ///< 0: not scheduled in real time
  long policy = 0;             ///< of SCHED_OTHER, SCHED_FIFO…
};

/// Nothing when the text is no such file: its process has gone.
std::optional<ProcStat> parseProcStat(std::string_view text);

/// "other", "fifo", "rr", "batch", "idle", "deadline", or the number.
std::string schedulingPolicyName(long policy);

/// The numbers that name entries of the directory, ascending: processes in /proc,
/// threads in /proc/<pid>/task.
std::vector<std::int32_t> numbersIn(int directory, const char* path);

}  // namespace tal
