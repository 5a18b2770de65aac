// What the store's writer thread sustains, and what an event costs the queue
// that hands it over. Writes to the working directory's file system.

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <optional>
#include <string>
#include <thread>

#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/store/StoreAnalyticsSink.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {
namespace {

using std::chrono_literals::operator""min;
using std::chrono_literals::operator""us;

constexpr std::string_view kName = "org.vantle.longformaudio.Playback.Start";

class FixedSettings final : public SettingsStore {
 public:
  explicit FixedSettings(std::int64_t max_mebibytes) : max_mebibytes_(max_mebibytes) {}
  std::optional<MessageValue> value(std::string_view, std::string_view key) const override {
    if (key == "max_mebibytes") return MessageValue(max_mebibytes_);
    return std::nullopt;
  }
  bool setValue(std::string_view, std::string_view, const MessageValue&) override { return false; }
  void refresh(std::string_view) override {}

 private:
  std::int64_t max_mebibytes_;
};

// A store in a directory of its own, gone with the object.
class BenchStore {
 public:
  explicit BenchStore(std::int64_t max_mebibytes) : settings_(max_mebibytes) {
    std::string name = "store-bench-XXXXXX";
    if (!::mkdtemp(name.data())) std::abort();
    directory_ = name;
    writer_.emplace(StoreWriter::Dependencies{
        .directory = directory_, .settings = settings_, .clock = clock_, .log = log_.service});
  }
  BenchStore(const BenchStore&) = delete;
  BenchStore& operator=(const BenchStore&) = delete;
  ~BenchStore() {
    writer_.reset();
    std::filesystem::remove_all(directory_);
  }

  StoreWriter& writer() { return *writer_; }
  const LinuxClock& clock() const { return clock_; }
  const LogChannels& log() const { return log_; }
  const FixedSettings& settings() const { return settings_; }

 private:
  FixedSettings settings_;
  LinuxClock clock_;
  LogChannels log_{nullptr};
  std::filesystem::path directory_;
  std::optional<StoreWriter> writer_;
};

StoreRow rowOf(std::string_view payload, double now) {
  return {.table = StoreTable::kEvents, .recorded_at = now, .number = 0, .name = kName, .payload = payload};
}

// Appends as fast as the back-log allows until all rows are committed.
void sustained(benchmark::State& state) {
  constexpr int kRows = 1'500'000;
  const std::string payload(400, 'x');
  for (auto _ : state) {
    BenchStore store(state.range(0));
    StoreWriter& writer = store.writer();
    const auto start = std::chrono::steady_clock::now();
    const double now = store.clock().secondsSince1970();
    for (int row = 0; row < kRows; ++row) {
      while (writer.overBound()) std::this_thread::sleep_for(100us);
      writer.append(rowOf(payload, now));
    }
    if (!writer.commitNow(5min) || writer.wasGivenUp({1, kRows})) state.SkipWithError("rows were lost");
    state.SetIterationTime(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
  }
  state.SetItemsProcessed(state.iterations() * kRows);
}
BENCHMARK(sustained)
    ->ArgName("max_mebibytes")
    ->Arg(4096)  // never full
    ->Arg(128)   // retention deletes as much as is written
    ->UseManualTime()
    ->Iterations(1)
    ->Unit(benchmark::kMillisecond);

// One row, and the wait until it is committed: what a durable reply adds to a
// single request.
void durableRow(benchmark::State& state) {
  BenchStore store(512);
  const std::string payload(400, 'x');
  const double now = store.clock().secondsSince1970();
  for (auto _ : state) {
    store.writer().append(rowOf(payload, now));
    store.writer().commitNow(1min);
  }
}
BENCHMARK(durableRow)->UseRealTime()->Unit(benchmark::kMicrosecond);

// What the reporting queue pays for one event of twelve keys.
void sendEvent(benchmark::State& state) {
  BenchStore store(512);
  StoreAnalyticsSink sink(
      {.store = store.writer(),
       .clock = store.clock(),
       .wanted = {
           .settings = store.settings(), .log = store.log().service, .coarse_now = LinuxClock::coarse}});
  MessageDict dict;
  for (int i = 0; i < 6; ++i) dict.set("session_number_" + std::to_string(i), i * 1000.5);
  for (int i = 0; i < 6; ++i) dict.set("session_text_" + std::to_string(i), "Built-in Audio Analog Stereo");
  for (auto _ : state) {
    if (!sink.eventIsWanted(kName)) continue;
    sink.sendEventWithPayloadProvider(kName, [&] { return dict; });
    if (store.writer().overBound()) {
      state.PauseTiming();
      store.writer().commitNow(1min);
      state.ResumeTiming();
    }
  }
}
BENCHMARK(sendEvent)->UseRealTime();

// A store made anew, and one opened again: both are part of the start.
void makeStore(benchmark::State& state) {
  for (auto _ : state) {
    std::optional<BenchStore> store(512);
    benchmark::DoNotOptimize(store->writer().sequence());
    state.PauseTiming();
    store.reset();
    state.ResumeTiming();
  }
}
BENCHMARK(makeStore)->UseRealTime()->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
