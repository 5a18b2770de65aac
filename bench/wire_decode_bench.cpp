// What it costs the I/O thread to decode a request, and the queue to encode a reply.

#include <benchmark/benchmark.h>

#include <string>
#include <vector>

#include "wire/CborWriter.h"
#include "wire/ReplyEncoder.h"
#include "wire/RequestDecoder.h"

namespace tal {
namespace {

constexpr int kFrames = 64;

MessageDict playbackStart(int number) {
  return {{"session_output_running", true},
          {"RvSessionVolume", 0.0625 * (number % 17)},
          {"active_devices", "Built-in Audio Analog Stereo"},
          {"session_selected_format", "S16LE 44100 Hz"},
          {"mFormatID", "raw"},
          {"mChannelsPerFrame", 2},
          {"stretch_index", number},
          {"talreporting_timestamp", MessageDate{1769870702.123456 + number}},
          {"HostApplicationDisplayID", "org.example.player"},
          {"audiotag", number},
          {"session_duration", 12.5 + number},
          {"issue_type", "overload"}};
}

std::string requestWith(const MessageDict& message) {
  std::string frame;
  CborWriter writer(frame);
  writer.array(6);
  writer.unsignedInteger(static_cast<std::uint64_t>(Operation::kSendMessage));
  writer.unsignedInteger(1000);
  writer.dict(message);
  writer.unsignedInteger(4);
  writer.unsignedInteger(1);
  writer.array(1);
  writer.signedInteger(7);
  return frame;
}

void decodeAll(benchmark::State& state, const std::vector<std::string>& frames) {
  RequestDecoder decoder;
  Request request;
  std::size_t next = 0;
  for (auto _ : state) {
    if (decoder.decode(frames[next], request)) state.SkipWithError("refused");
    benchmark::DoNotOptimize(request.message);
    next = next + 1 == frames.size() ? 0 : next + 1;
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations()));
}

// The same keys in every message, other values.
void twelveKeys(benchmark::State& state) {
  std::vector<std::string> frames(kFrames);
  for (int i = 0; i < kFrames; ++i) frames[static_cast<std::size_t>(i)] = requestWith(playbackStart(i));
  decodeAll(state, frames);
}
BENCHMARK(twelveKeys);

// Several kinds of messages in no order that could be foreseen.
void twelveKeysOfSeveralKinds(benchmark::State& state) {
  std::vector<std::string> frames;
  for (int i = 0; i < kFrames; ++i) {
    MessageDict message = playbackStart(i);
    message.erase(message.keyAt(static_cast<std::size_t>(i * i) % message.size()));
    frames.push_back(requestWith(message));
  }
  decodeAll(state, frames);
}
BENCHMARK(twelveKeysOfSeveralKinds);

// Keys that no message had before: what a client can make the daemon do.
void twelveKeysThatChange(benchmark::State& state) {
  std::vector<std::string> frames;
  for (int i = 0; i < 1000; ++i) {
    MessageDict message;
    for (int key = 0; key < 12; ++key) {
      message.set(std::string_view("key_" + std::to_string(i * 12 + key)), key);
    }
    frames.push_back(requestWith(message));
  }
  decodeAll(state, frames);
}
BENCHMARK(twelveKeysThatChange);

void encodeReply(benchmark::State& state) {
  std::string out;
  ReplyEncoder replies(out);
  std::uint64_t call = 1000;
  for (auto _ : state) {
    if (out.size() > 4096) out.clear();
    replies.null(++call);
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(encodeReply);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
