#include "platform/linux/capture/ProcessReport.h"

#include <fcntl.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <optional>
#include <string_view>

#include "platform/linux/capture/ProcFile.h"
#include "platform/linux/capture/ProcStat.h"
#include "platform/linux/logging/LogLine.h"
#include "platform/linux/process/FileDescriptor.h"

namespace tal {

namespace {

constexpr std::size_t kMostProcesses = 512;
constexpr std::size_t kMostThreads = 256;  // of one process
constexpr std::size_t kMostListed = 4096;  // lines of a table
constexpr std::size_t kMostTextBytes = std::size_t{4} << 20;
constexpr std::size_t kMostCommandBytes = 4096;

template <typename... Arguments>
void appendf(std::string& out, const char* format, Arguments... arguments) {
  std::array<char, 256> line{};
  const int size = std::snprintf(line.data(), line.size(), format, arguments...);
  if (size > 0) out.append(line.data(), std::min(static_cast<std::size_t>(size), line.size() - 1));
}

FileDescriptor openPlace(int directory, const std::string& path) {
  return FileDescriptor(::openat(directory, path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
}

std::optional<ProcStat> readStat(int directory) {
  const auto text = readProcFile(directory, "stat");
  return text ? parseProcStat(*text) : std::nullopt;
}

// The command line, its arguments apart by blanks; a kernel thread has none.
std::string commandOf(int process, const ProcStat& stat) {
  std::string text = readProcFile(process, "cmdline", kMostCommandBytes).value_or("");
  while (!text.empty() && text.back() == '\0') text.pop_back();
  if (text.empty()) return '[' + stat.name + ']';
  std::replace(text.begin(), text.end(), '\0', ' ');
  return text;
}

void appendMemory(std::string& out, int process) {
  const std::string status = readProcFile(process, "status").value_or("");
  const std::string rollup = readProcFile(process, "smaps_rollup").value_or("");
  const auto field = [&out](std::string_view name, std::string_view value) {
    if (value.empty()) return;
    out += "  ";
    out += name;
    out += ' ';
    out += value;
  };
  out += "  memory  ";
  field("resident", procField(status, "VmRSS"));
  field("proportional", procField(rollup, "Pss"));
  field("peak", procField(status, "VmHWM"));
  field("swapped", procField(status, "VmSwap"));
  field("locked", procField(status, "VmLck"));
  out += "\n  switches  ";
  field("voluntary", procField(status, "voluntary_ctxt_switches"));
  field("forced", procField(status, "nonvoluntary_ctxt_switches"));
  out += '\n';
}

void appendThread(std::string& out, int thread, std::int32_t identifier) {
  const auto stat = readStat(thread);
  if (!stat) return;
  const std::string waits_in = readProcFile(thread, "wchan").value_or("?");
  appendf(out, "    %7d %c  cpu %ld  %10.2f s  %-8s %2ld  ", identifier, stat->state, stat->last_processor,
          stat->cpu_seconds, schedulingPolicyName(stat->policy).c_str(), stat->realtime_priority);
  appendEscaped(out, waits_in == "0" ? "-" : waits_in);
  out += "  ";
  appendEscaped(out, stat->name);
  out += '\n';
  const std::string stack = readProcFile(thread, "stack").value_or("");
  for (std::string_view rest = stack; !rest.empty();) {
    out += "            ";
    appendEscaped(out, takeLine(rest));
    out += '\n';
  }
}

void appendThreads(std::string& out, int process) {
  const std::vector<std::int32_t> threads = numbersIn(process, "task");
  out += "  threads\n";
  for (std::size_t i = 0; i < std::min(threads.size(), kMostThreads); ++i) {
    const FileDescriptor thread = openPlace(process, "task/" + std::to_string(threads[i]));
    if (thread) appendThread(out, thread.get(), threads[i]);
  }
  if (threads.size() > kMostThreads) {
    out += "    and " + std::to_string(threads.size() - kMostThreads) + " more\n";
  }
}

// Everything is read through one open directory, which never names another
// process that was given the number meanwhile.
std::optional<std::string> reportOf(int proc, std::int32_t identifier) {
  const FileDescriptor process = openPlace(proc, std::to_string(identifier));
  if (!process) return std::nullopt;
  const auto stat = readStat(process.get());
  if (!stat) return std::nullopt;
  std::string out = "process " + std::to_string(identifier) + "  ";
  appendEscaped(out, stat->name);
  out += "\n  command  ";
  appendEscaped(out, commandOf(process.get(), *stat));
  appendf(out, "\n  state  %c  parent %ld  nice %ld  cpu %.2f s  threads %ld", stat->state, stat->parent,
          stat->nice, stat->cpu_seconds, stat->threads);
  const FileDescriptor files = openPlace(process.get(), "fd");
  const std::string count = files ? std::to_string(numbersIn(files.get(), ".").size()) : "?";
  out += "  open files " + count + '\n';
  appendMemory(out, process.get());
  appendThreads(out, process.get());
  if (!readStat(process.get())) return std::nullopt;
  return out;
}

}  // namespace

std::string processReport(const std::vector<std::int32_t>& process_identifiers,
                          const std::filesystem::path& proc) {
  std::string out;
  const FileDescriptor directory = openPlace(AT_FDCWD, proc.string());
  if (!directory) return out;
  std::size_t told = 0;
  for (const std::int32_t identifier : process_identifiers) {
    if (told == kMostProcesses || out.size() > kMostTextBytes) {
      out += "and " + std::to_string(process_identifiers.size() - told) + " more processes\n";
      break;
    }
    ++told;
    if (const auto report = reportOf(directory.get(), identifier)) out += *report + '\n';
  }
  return out;
}

std::string processTable(const std::filesystem::path& proc) {
  const FileDescriptor directory = openPlace(AT_FDCWD, proc.string());
  std::string out = "    pid  parent state threads nice       cpu s   resident KiB  name\n";
  if (!directory) return out;
  std::size_t lines = 0;
  for (const std::int32_t identifier : numbersIn(directory.get(), ".")) {
    const auto text = readProcFile(directory.get(), (std::to_string(identifier) + "/stat").c_str());
    const auto stat = text ? parseProcStat(*text) : std::nullopt;
    if (!stat) continue;
    if (++lines > kMostListed) break;
    appendf(out, "%7d %7ld %5c %7ld %4ld %11.2f %14llu  ", identifier, stat->parent, stat->state,
            stat->threads, stat->nice, stat->cpu_seconds,
            static_cast<unsigned long long>(stat->resident_bytes / 1024));
    appendEscaped(out, stat->name);
    out += '\n';
  }
  return out;
}

std::string busyThreads(const std::filesystem::path& proc) {
  const FileDescriptor directory = openPlace(AT_FDCWD, proc.string());
  std::string out = "    pid     tid state cpu  policy   priority       cpu s  waits in, name\n";
  if (!directory) return out;
  std::size_t lines = 0;
  for (const std::int32_t process : numbersIn(directory.get(), ".")) {
    const std::string tasks = std::to_string(process) + "/task";
    for (const std::int32_t thread : numbersIn(directory.get(), tasks.c_str())) {
      const FileDescriptor place = openPlace(directory.get(), tasks + '/' + std::to_string(thread));
      const auto stat = place ? readStat(place.get()) : std::nullopt;
      if (!stat || (stat->state != 'R' && stat->state != 'D' && stat->realtime_priority == 0)) continue;
      if (++lines > kMostListed) return out;
      appendf(out, "%7d %7d %5c %3ld  %-8s %8ld %11.2f  ", process, thread, stat->state, stat->last_processor,
              schedulingPolicyName(stat->policy).c_str(), stat->realtime_priority, stat->cpu_seconds);
      appendEscaped(out, readProcFile(place.get(), "wchan").value_or("?"));
      out += "  ";
      appendEscaped(out, stat->name);
      out += '\n';
    }
  }
  return out;
}

}  // namespace tal
