// What a send through the client library costs the thread that sends: a message of 12 keys, encoded and
// queued.

#include <benchmark/benchmark.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "client/talreporting.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::uint32_t kWaitMs = 10000;
/// As much as an audio program sends at once, at most.
constexpr int kBurst = 32;

/// The least that a daemon does: reads requests and answers each with null, the hello with its version.
class AnsweringDaemon {
 public:
  AnsweringDaemon() {
    std::string name = std::filesystem::temp_directory_path() / "talbench.XXXXXX";
    if (!mkdtemp(name.data())) throw std::runtime_error("no temporary directory");
    directory_ = name;
    path_ = directory_ / "socket";
    listening_ = ::socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path_.copy(address.sun_path, path_.size());
    if (::bind(listening_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        ::listen(listening_, 1) != 0) {
      throw std::runtime_error("cannot listen");
    }
    thread_ = std::thread([this] { serve(); });
  }
  /// The client must have closed its connection.
  ~AnsweringDaemon() {
    thread_.join();
    ::close(listening_);
    std::filesystem::remove_all(directory_);
  }

  const char* path() const { return path_.c_str(); }

 private:
  void serve() const {
    const int peer = ::accept(listening_, nullptr, nullptr);
    std::vector<unsigned char> in(1 << 20);
    std::size_t held = 0;
    std::string out;
    for (ssize_t got; (got = ::read(peer, in.data() + held, in.size() - held)) > 0;) {
      held += static_cast<std::size_t>(got);
      std::size_t at = 0;
      while (held - at >= 4) {
        std::uint32_t length = 0;
        for (int i = 3; i >= 0; --i) length = length << 8 | in[at + static_cast<std::size_t>(i)];
        if (held - at < 4 + length) break;
        answer(in.data() + at + 4, out);
        at += 4 + length;
      }
      std::copy(in.begin() + static_cast<std::ptrdiff_t>(at), in.begin() + static_cast<std::ptrdiff_t>(held),
                in.begin());
      held -= at;
      if (::send(peer, out.data(), out.size(), MSG_NOSIGNAL) < 0) break;
      out.clear();
    }
    ::close(peer);
  }

  /// `request` is [operation, call, …], with an operation of one byte.
  static void answer(const unsigned char* request, std::string& out) {
    const std::size_t callBytes = request[2] < 0x18 ? 1 : 1 + (std::size_t{1} << (request[2] - 0x18));
    std::string body(1, '\x83');
    body.append(reinterpret_cast<const char*>(request + 2), callBytes);
    body.append(1, '\0');
    body.append(request[1] == TAL_HELLO ? "\xA1\x67version\x01" : "\xF6");
    out += static_cast<char>(body.size());
    out.append(3, '\0');
    out += body;
  }

  std::filesystem::path directory_;
  std::string path_;
  int listening_ = -1;
  std::thread thread_;
};

void build(tal_message* message, std::int64_t index) {
  tal_message_reset(message);
  tal_message_add_bool(message, "session_output_running", true);
  tal_message_add_double(message, "RvSessionVolume", 0.5625);
  tal_message_add_string(message, "active_devices", "Built-in Audio Analog Stereo");
  tal_message_add_string(message, "session_selected_format", "S16LE 44100 Hz");
  tal_message_add_string(message, "mFormatID", "raw");
  tal_message_add_uint(message, "mChannelsPerFrame", 2);
  tal_message_add_int(message, "stretch_index", index);
  tal_message_add_double(message, "talreporting_timestamp", 1767225600.25 + static_cast<double>(index));
  tal_message_add_string(message, "HostApplicationDisplayID", "org.example.player");
  tal_message_add_uint(message, "smallest_buffer_frame_size", 1024);
  tal_message_add_uint(message, "xrun_episodes", 0);
  tal_message_add_double(message, "session_duration", 12.5);
}

tal_connection* connectTo(const char* path, std::size_t queueBytes, std::uint32_t pollMs) {
  tal_options options{};
  options.struct_bytes = sizeof options;
  options.socket_path = path;
  options.queue_bytes = queueBytes;
  options.poll_interval_ms = pollMs;
  return tal_connect(&options, nullptr);
}

void buildOnly(benchmark::State& state) {
  tal_message* message = tal_message_new(0);
  std::int64_t index = 0;
  for ([[maybe_unused]] auto _ : state) {
    build(message, ++index);
    benchmark::DoNotOptimize(message);
  }
  state.counters["bytes"] = static_cast<double>(tal_message_bytes(message));
  tal_message_free(message);
}
BENCHMARK(buildOnly);

/// Nobody takes anything out: the cost of the sender's own work, in memory that it has not touched lately.
void buildAndSendWhileTheDaemonIsAway(benchmark::State& state) {
  tal_connection* connection = connectTo("/nonexistent/socket", std::size_t{256} << 20, 0);
  tal_message* message = tal_message_new(0);
  std::int64_t index = 0;
  for ([[maybe_unused]] auto _ : state) {
    build(message, ++index);
    if (tal_session_send(connection, 7, message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START) != TAL_OK) {
      state.SkipWithError("the queue is full");
      break;
    }
  }
  tal_message_free(message);
  tal_connection_free(connection);
}
BENCHMARK(buildAndSendWhileTheDaemonIsAway)->Iterations(400000);

/// Bursts to a daemon that answers. The library's thread sleeps when a burst begins, so each pays one
/// wake-up, unless the thread looks by itself (`poll_ms`). Only the sending is timed.
void buildAndSendInBursts(benchmark::State& state) {
  AnsweringDaemon daemon;
  tal_connection* connection = connectTo(daemon.path(), 0, static_cast<std::uint32_t>(state.range(1)));
  tal_message* message = tal_message_new(0);
  const auto burst = state.range(0);
  std::int64_t index = 0;
  tal_wait_connected(connection, kWaitMs, nullptr);
  for ([[maybe_unused]] auto _ : state) {
    const auto start = Clock::now();
    for (std::int64_t i = 0; i < burst; ++i) {
      build(message, ++index);
      if (tal_session_send(connection, 7, message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START) != TAL_OK) {
        state.SkipWithError("lost a message");
      }
    }
    state.SetIterationTime(std::chrono::duration<double>(Clock::now() - start).count());
    tal_flush(connection, kWaitMs);
  }
  state.counters["per_message"] =
      benchmark::Counter(static_cast<double>(state.iterations() * burst),
                         benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
  tal_message_free(message);
  tal_connection_free(connection);
}
BENCHMARK(buildAndSendInBursts)
    ->ArgNames({"burst", "poll_ms"})
    ->Args({1, 0})
    ->Args({kBurst, 0})
    ->Args({1000, 0})
    ->Args({kBurst, 1})
    ->UseManualTime();

}  // namespace
