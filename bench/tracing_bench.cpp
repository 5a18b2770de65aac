// What signposts cost the thread that sets them, and what reading a large trace
// takes. Recording needs the tracer's session daemon, which is started for it.

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <future>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>

#include "client/talreporting.h"
#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"
#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/tracing/LinuxTracing.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

constexpr char kSubsystem[] = "org.vantle.audio";
constexpr char kName[] = "render-cycle";

void setPair() {
  talreporting_signpost_begin(kSubsystem, kName);
  talreporting_signpost_end(kSubsystem, kName);
}

/// A recording from construction to `finish`, which answers where the trace lies.
class Recorded {
 public:
  Recorded() {
    std::string name = std::filesystem::temp_directory_path() / "talbench.XXXXXX";
    if (!::mkdtemp(name.data())) throw std::runtime_error("no temporary directory");
    directory_ = name;
    // Programs of other users than root find the session daemon here.
    ::setenv("LTTNG_HOME", (directory_ / "lttng").c_str(), 1);
    log_ = std::make_unique<LinuxDiagnosticLog>(directory_);
    tracing_ = std::make_unique<LinuxTracing>(LinuxTracing::Options{.log_directory = directory_,
                                                                    .runtime_directory = directory_,
                                                                    .diagnostic_log = *log_,
                                                                    .clock = clock_,
                                                                    .log = silent_});
    auto& service = tracing_->platform().perftrail;
    session_ = service.makeSession(*service.makeConfiguration(PerftrailConfiguration::Template::kDefault));
    session_->setDelegate(delegate_);
    session_->start();
    const std::string error = delegate_->started.get_future().get();
    if (!error.empty()) throw std::runtime_error(error);
    if (talreporting_signpost_enable() != TAL_OK) throw std::runtime_error("the tracer is not installed");
  }
  Recorded(const Recorded&) = delete;
  Recorded& operator=(const Recorded&) = delete;
  ~Recorded() {
    session_.reset();
    tracing_.reset();
    std::filesystem::remove_all(directory_);
  }

  std::string finish() {
    session_->stop();
    return delegate_->complete.get_future().get();
  }
  SkeinLibrary& skein() { return tracing_->platform().skein; }

 private:
  struct Delegate final : PerftrailDelegate {
    void perftrailDidStart(const Error& error) override { started.set_value(error.value_or("")); }
    void perftrailDidStop(const Error&) override {}
    void perftrailDidComplete(const std::string& url, std::string_view, const Error&) override {
      complete.set_value(url);
    }
    std::promise<std::string> started;
    std::promise<std::string> complete;
  };

  std::filesystem::path directory_;
  LinuxClock clock_;
  LogChannel silent_{"talrt", nullptr, LogLevel::kError};
  std::unique_ptr<LinuxDiagnosticLog> log_;
  std::unique_ptr<LinuxTracing> tracing_;
  std::shared_ptr<Delegate> delegate_ = std::make_shared<Delegate>();
  std::shared_ptr<PerftrailSession> session_;
};

// Runs first: the tracer, once loaded, stays.
void signpostWithNothingRecording(benchmark::State& state) {
  for (auto _ : state) setPair();
  state.SetItemsProcessed(2 * state.iterations());
}

void signpostRecorded(benchmark::State& state) {
  Recorded recorded;
  for (auto _ : state) setPair();
  state.SetItemsProcessed(2 * state.iterations());
  recorded.skein().acknowledge();
  const auto trace = recorded.skein().traceModelClass()->modelWithTrace(recorded.finish());
  const auto expected = static_cast<std::uint64_t>(2 * state.iterations());
  // A signpost that is thrown away costs less than one that is kept.
  if (!trace.model || trace.model->eventCount() != expected) state.SkipWithError("not all were recorded");
}

void readTraceOfAMillionEvents(benchmark::State& state) {
  constexpr int kBursts = 100;
  constexpr int kPairsInABurst = 5'000;
  Recorded recorded;
  for (int burst = 0; burst < kBursts; ++burst) {
    for (int pair = 0; pair < kPairsInABurst; ++pair) setPair();
    std::this_thread::sleep_for(20ms);  // for the tracer to keep up
  }
  const std::string url = recorded.finish();
  recorded.skein().acknowledge();
  std::uint64_t events = 0;
  for (auto _ : state) {
    const auto trace = recorded.skein().traceModelClass()->modelWithTrace(url);
    const auto signposts = recorded.skein().signpostModelClass()->modelWithTraceModel(*trace.model);
    const auto probes = recorded.skein().probeFactoryClass()->probesWithDescriptions(
        {{.name = "gap", .begin = "end:render-cycle", .end = "begin:render-cycle"}}, *trace.model);
    events = trace.model->eventCount();
    benchmark::DoNotOptimize(signposts.model->signposts().size());
    benchmark::DoNotOptimize(probes.size());
  }
  state.counters["events"] = static_cast<double>(events);
}

BENCHMARK(signpostWithNothingRecording);
// As many as fit into the tracer's buffers, so that none is thrown away.
BENCHMARK(signpostRecorded)->Iterations(40'000)->Unit(benchmark::kNanosecond);
BENCHMARK(readTraceOfAMillionEvents)->Iterations(3)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
