// What one stored event costs to write as JSON.

#include <benchmark/benchmark.h>

#include <string>

#include "core/MessageJson.h"

namespace tal {
namespace {

MessageDict playbackStart() {
  return {{"session_output_running", true},
          {"RvSessionVolume", 0.4375},
          {"active_devices", "Built-in Audio Analog Stereo"},
          {"session_selected_format", "S16LE 44100 Hz"},
          {"mFormatID", "raw"},
          {"mChannelsPerFrame", 2},
          {"stretch_index", 17},
          {"talreporting_timestamp", 1769870702.123456},
          {"HostApplicationDisplayID", "org.example.player"},
          {"audiotag", 0},
          {"session_duration", 12.5},
          {"issue_type", "overload"}};
}

void twelveKeys(benchmark::State& state) {
  const MessageDict dict = playbackStart();
  std::string out;
  for (auto _ : state) {
    out.clear();
    appendJson(out, dict);
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                          static_cast<std::int64_t>(out.size()));
}
BENCHMARK(twelveKeys);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
