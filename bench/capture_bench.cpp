// What a capture of a machine with 300 processes costs, and how long a request
// for one holds the reporting queue.

#include <benchmark/benchmark.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <deque>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/capture/CaptureService.h"
#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/process/LinuxProcessTable.h"

namespace tal {
namespace {

namespace fs = std::filesystem;

constexpr int kProcesses = 300;
constexpr int kMessages = 200;

/// Runs what is posted when it is told to.
class PatientQueue final : public SerialQueue {
 public:
  void post(Task task) override { tasks_.push_back(std::move(task)); }
  void postAfter(std::chrono::nanoseconds, Task) override {}
  bool isCurrent() const override { return true; }
  void run() {
    for (; !tasks_.empty(); tasks_.pop_front()) tasks_.front()();
  }

 private:
  std::deque<Task> tasks_;
};

class NoThrottle final : public SettingsStore {
 public:
  std::optional<MessageValue> value(std::string_view, std::string_view key) const override {
    if (key == "daily_limit") return MessageValue(1000);
    return std::nullopt;
  }
  void refresh(std::string_view) override {}
  bool setValue(std::string_view, std::string_view, const MessageValue&) override { return false; }
};

class NoLog final : public LogSink {
 public:
  void write(std::string_view, LogLevel, std::string_view) override {}
};

/// Processes that sleep.
class Children {
 public:
  Children() {
    for (int i = 0; i < kProcesses; ++i) {
      const pid_t child = ::fork();
      if (child == 0) {
        for (;;) ::pause();
      }
      identifiers_.push_back(child);
    }
  }
  Children(const Children&) = delete;
  Children& operator=(const Children&) = delete;
  ~Children() {
    for (const pid_t child : identifiers_) ::kill(child, SIGKILL);
    for (const pid_t child : identifiers_) ::waitpid(child, nullptr, 0);
  }
  const std::vector<std::int32_t>& identifiers() const { return identifiers_; }

 private:
  std::vector<std::int32_t> identifiers_;
};

class Bed {
 public:
  Bed() {
    std::string name = fs::temp_directory_path() / "tal-bench-XXXXXX";
    if (::mkdtemp(name.data())) directory_ = name;
    for (std::size_t i = 0; i < LogRing::kLines; ++i) {
      ring_.write("talrr", LogLevel::kDebug, std::string(300, 'x'));
    }
    service_ = std::make_unique<CaptureService>(CaptureService::Dependencies{
        .reporting_queue = reporting,
        .work_queue = work,
        .clock = clock_,
        .settings = settings_,
        .processes = processes_,
        .log = log_.hound,
        .writer =
            std::make_shared<const CaptureWriter>(CaptureWriter::Dependencies{.log_directory = directory_,
                                                                              .state_directory = directory_,
                                                                              .clock = clock_,
                                                                              .settings = settings_,
                                                                              .log_ring = ring_,
                                                                              .log = log_.hound}),
        .client_processes = [this] { return children_.identifiers(); }});
    work.run();
  }
  Bed(const Bed&) = delete;
  Bed& operator=(const Bed&) = delete;
  ~Bed() {
    std::error_code ignored;
    fs::remove_all(directory_, ignored);
  }

  /// Asks as the bug-capture worker does, for another fault each time.
  void ask() {
    SymptomContext context{.session = "reporterID=7", .last_messages = {}};
    for (int i = 0; i < kMessages; ++i) {
      context.last_messages.push_back({AudioEventCategory::kPlayback, AudioEventType::kGeneric, message_});
    }
    const auto client = service_->makeClient(std::move(context));
    const std::string fault = std::to_string(++asked_);
    client->snapshotWithSignature({.signature = client->signatureWithDomain({.domain = "Sonarium",
                                                                             .type = fault,
                                                                             .sub_type = "Playback",
                                                                             .subtype_context = "Energylog",
                                                                             .detected_process = "Unknown"}),
                                   .reply = [this](const std::optional<MessageDict>& response) {
                                     written += response->find(kHoundDiagReplySuccess)->toBool() ? 1 : 0;
                                   }});
  }

  PatientQueue reporting;
  PatientQueue work;
  int written = 0;

 private:
  fs::path directory_;
  NoLog no_log_;
  LogChannels log_{&no_log_, LogLevel::kError};
  LogRing ring_{no_log_, LogLevel::kError};
  LinuxClock clock_;
  LinuxProcessTable processes_;
  NoThrottle settings_;
  Children children_;
  const MessageDict message_{{"session_output_running", true}, {"RvSessionVolume", 0.5}, {"n", 1}};
  int asked_ = 0;
  std::unique_ptr<CaptureService> service_;
};

void CaptureOf300Processes(benchmark::State& state) {
  Bed bed;
  std::chrono::duration<double> longest{0};
  for (auto _ : state) {
    const auto before = std::chrono::steady_clock::now();
    bed.ask();
    longest = std::max(longest, std::chrono::duration<double>(std::chrono::steady_clock::now() - before));
    bed.work.run();
    bed.reporting.run();
  }
  if (bed.written != static_cast<int>(state.iterations())) state.SkipWithError("a capture was refused");
  state.counters["longest_hold_of_the_queue_us"] = longest.count() * 1e6;
}
BENCHMARK(CaptureOf300Processes)->Unit(benchmark::kMillisecond)->Iterations(10);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
