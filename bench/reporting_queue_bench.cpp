// The hand-over to the reporting queue: a single task and back, and a stream.

#include <benchmark/benchmark.h>

#include <future>
#include <string_view>

#include "platform/linux/process/ReportingQueue.h"

namespace tal {
namespace {

constexpr std::string_view kLabel = "org.vantle.talsys.reporting.server";

// Between two sleeping threads, as a lone request meets them.
void thereAndBack(benchmark::State& state) {
  ReportingQueue near("near");
  ReportingQueue far(kLabel);
  for (auto _ : state) {
    std::promise<void> back;
    far.post([&] { near.post([&] { back.set_value(); }); });
    back.get_future().wait();
  }
}
BENCHMARK(thereAndBack)->UseRealTime();

void stream(benchmark::State& state) {
  ReportingQueue queue(kLabel);
  std::uint64_t ran = 0;
  for (auto _ : state) queue.post([&ran] { ++ran; });
  queue.stop();
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(stream)->UseRealTime();

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
