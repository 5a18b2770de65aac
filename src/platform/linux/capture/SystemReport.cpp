#include "platform/linux/capture/SystemReport.h"

#include <chrono>
#include <filesystem>
#include <initializer_list>
#include <system_error>

#include "platform/linux/capture/PipeWireNodes.h"
#include "platform/linux/capture/ProcFile.h"
#include "platform/linux/capture/ProcessReport.h"
#include "platform/linux/capture/ToolOutput.h"

namespace tal {

namespace {

constexpr std::chrono::milliseconds kToolTakesAtMost{500};
constexpr std::size_t kMostTraceReadBytes = std::size_t{64} << 20;
constexpr std::size_t kMostTraceBytes = std::size_t{8} << 20;  // of its newest end

void appendSection(std::string& out, std::string_view name, std::string_view text) {
  out += "== ";
  out += name;
  out += '\n';
  out += text;
  if (!text.empty() && text.back() != '\n') out += '\n';
  out += '\n';
}

// What is not there or may not be read is left out.
void appendFiles(std::string& out, std::initializer_list<const char*> paths) {
  for (const char* path : paths) {
    const auto text = readProcFile(path);
    if (text && !text->empty()) appendSection(out, path, *text);
  }
}

std::string processorFrequencies() {
  std::string out;
  std::error_code none;
  for (const auto& entry : std::filesystem::directory_iterator("/sys/devices/system/cpu/cpufreq", none)) {
    const std::string place = entry.path().string();
    const auto governor = readProcFile(place + "/scaling_governor");
    const auto now = readProcFile(place + "/scaling_cur_freq");
    if (!governor || !now) continue;
    std::string_view governor_line = *governor;
    std::string_view now_line = *now;
    out += entry.path().filename().string();
    out += "  ";
    out += takeLine(governor_line);
    out += "  ";
    out += takeLine(now_line);
    out += " kHz\n";
  }
  return out;
}

}  // namespace

std::string systemReport() {
  std::string out;
  appendFiles(out, {"/proc/version", "/proc/loadavg", "/proc/uptime", "/proc/pressure/cpu",
                    "/proc/pressure/io", "/proc/pressure/memory", "/proc/meminfo"});
  if (const auto dump = toolOutput({"pw-dump", "--no-colors"}, kToolTakesAtMost)) {
    appendSection(out, "PipeWire nodes", pipeWireNodes(*dump));
  }
  appendSection(out, "processes", processTable());
  return out;
}

std::string schedulerReport() {
  std::string out;
  appendFiles(out, {"/proc/loadavg", "/proc/pressure/cpu", "/proc/sys/kernel/sched_rt_runtime_us",
                    "/proc/sys/kernel/sched_rt_period_us"});
  if (const std::string frequencies = processorFrequencies(); !frequencies.empty()) {
    appendSection(out, "processor frequencies", frequencies);
  }
  appendSection(out, "threads that run, wait for the kernel or are in real time", busyThreads());
  appendFiles(out, {"/proc/stat", "/proc/schedstat", "/proc/softirqs", "/proc/interrupts",
                    "/sys/kernel/debug/sched/debug"});
  return out;
}

std::string traceBuffer() {
  for (const char* path : {"/sys/kernel/tracing/trace", "/sys/kernel/debug/tracing/trace"}) {
    if (auto text = readProcFile(path, kMostTraceReadBytes)) {
      if (text->size() > kMostTraceBytes) text->erase(0, text->size() - kMostTraceBytes);
      return *std::move(text);
    }
  }
  return {};
}

}  // namespace tal
