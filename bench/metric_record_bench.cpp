// What one metric record costs to encode.

#include <benchmark/benchmark.h>

#include <string>

#include "workers/sinks/AudioIssueDetected.h"

namespace tal {
namespace {

void encode(benchmark::State& state) {
  plumemetrics::AudioIssueDetected record;
  record.duration = 7;
  record.issuetype = "silence_on_any_channel";
  record.node = "Built-in Audio Analog Stereo";
  record.rtaidclient = "org.example.player";
  if (state.range(0) != 0) record.timestamp = 1'769'870'702'123'456;
  std::string bytes;
  for (auto _ : state) {
    bytes.clear();
    ProtobufWriter writer(bytes);
    record.writeTo(writer);
    benchmark::DoNotOptimize(bytes.data());
  }
}
BENCHMARK(encode)->ArgName("with_timestamp")->Arg(0)->Arg(1);

// As the submitter does it: into a string of its own.
void encodeIntoNewString(benchmark::State& state) {
  plumemetrics::AudioIssueDetected record;
  record.duration = 7;
  record.issuetype = "silence_on_any_channel";
  record.node = "Built-in Audio Analog Stereo";
  record.rtaidclient = "org.example.player";
  for (auto _ : state) {
    std::string bytes;
    ProtobufWriter writer(bytes);
    record.writeTo(writer);
    benchmark::DoNotOptimize(bytes.data());
  }
}
BENCHMARK(encodeIntoNewString);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
