// How long the daemon waits for the listing of processes: the whole run of
// `talresources`, its start included, over 300 of them. What else runs on the
// machine is kept out of the listing, so that figures can be compared.

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

namespace {

constexpr int kProcesses = 300;
// What each of them has of its own, so that there is memory to be counted.
constexpr std::size_t kBytesEach = std::size_t{1} << 20;

/// Processes, and a directory that is /proc with them alone.
class Processes {
 public:
  Processes() {
    if (!::mkdtemp(proc_.data())) return;
    for (int i = 0; i < kProcesses; ++i) {
      const pid_t process = ::fork();
      if (process == 0) sleepWithMemory();
      if (process < 0) return;
      identifiers_.push_back(process);
      const std::string name = std::to_string(process);
      std::filesystem::create_directory_symlink("/proc/" + name, proc_ + '/' + name);
    }
  }
  Processes(const Processes&) = delete;
  Processes& operator=(const Processes&) = delete;
  ~Processes() {
    for (const pid_t each : identifiers_) ::kill(each, SIGKILL);
    for (const pid_t each : identifiers_) ::waitpid(each, nullptr, 0);
    std::filesystem::remove_all(proc_);
  }
  const std::string& proc() const { return proc_; }
  std::size_t count() const { return identifiers_.size(); }

 private:
  [[noreturn]] static void sleepWithMemory() {
    std::vector<char> memory(kBytesEach, 'x');
    benchmark::DoNotOptimize(memory.data());
    while (true) ::pause();
  }

  std::string proc_ = std::filesystem::temp_directory_path() / "tal-bench-XXXXXX";
  std::vector<pid_t> identifiers_;
};

// Of those that have ended.
double processorMillisecondsOfChildren() {
  constexpr double kPerSecond = 1e3;
  constexpr double kPerMicrosecond = 1e-3;
  rusage usage{};
  ::getrusage(RUSAGE_CHILDREN, &usage);
  double sum = 0;
  for (const timeval& each : {usage.ru_utime, usage.ru_stime})
    sum +=
        static_cast<double>(each.tv_sec) * kPerSecond + static_cast<double>(each.tv_usec) * kPerMicrosecond;
  return sum;
}

bool runTalresources(std::string proc) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  char name[] = "talresources";
  char option[] = "--proc";
  char* const arguments[] = {name, option, proc.data(), nullptr};
  pid_t process = 0;
  const int error = ::posix_spawn(&process, TAL_RESOURCES_PATH, &actions, nullptr, arguments, environ);
  posix_spawn_file_actions_destroy(&actions);
  int status = -1;
  return error == 0 && ::waitpid(process, &status, 0) == process && status == 0;
}

void listingOf300Processes(benchmark::State& state) {
  const Processes processes;
  if (processes.count() != kProcesses) state.SkipWithError("cannot start 300 processes");
  const double before = processorMillisecondsOfChildren();
  for (auto _ : state) {
    if (!runTalresources(processes.proc())) state.SkipWithError("talresources failed");
  }
  // Of the tool itself, as others may use the machine, too.
  state.counters["cpu_ms"] =
      benchmark::Counter(processorMillisecondsOfChildren() - before, benchmark::Counter::kAvgIterations);
}

}  // namespace

BENCHMARK(listingOf300Processes)->Unit(benchmark::kMillisecond)->UseRealTime();

BENCHMARK_MAIN();
