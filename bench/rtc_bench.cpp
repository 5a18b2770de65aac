// What real-time messages cost: the hand-over on the reporting queue, and the way
// of a full outbox to a local broker (mosquitto, where it is installed).

#include <benchmark/benchmark.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/callstat/LinuxCallstatBackend.h"
#include "platform/linux/process/ElasticQueuePool.h"
#include "platform/linux/process/LinuxClock.h"
#include "workers/sinks/CallstatTraffic.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

constexpr int kBrokerPort = 18830;

MessageDict twelveKeys(std::int64_t number) {
  return {{"session_output_running", number % 2 == 0},
          {"RvSessionVolume", 0.4},
          {"active_devices", "Built-in Audio Stereo"},
          {"session_selected_format", "S16LE 44100 Hz"},
          {"mFormatID", "raw"},
          {"mChannelsPerFrame", 2},
          {"stretch_index", number},
          {"talreporting_timestamp", 1.8e9 + static_cast<double>(number)},
          {"session_duration", 0.25},
          {"issue_type", "overload"},
          {"smallest_buffer_frame_size", 256},
          {"io_cycle", number * 3}};
}

/// Counts messages and forgets them.
class CountingBackend final : public CallstatBackend {
 public:
  explicit CountingBackend(bool has_backends) : has_backends_(has_backends) {}

  std::optional<CallstatToken> newHierarchyTokenFromParentToken(const CallstatToken*) override {
    return CallstatToken{"bench"};
  }
  std::unique_ptr<CallstatSession> initWithSessionInfo(MessageDict, MessageDict,
                                                       const std::vector<std::string>&) override {
    return std::make_unique<Session>(has_backends_);
  }

 private:
  class Session final : public CallstatSession {
   public:
    explicit Session(bool has_backends) : has_backends_(has_backends) {}
    void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
      handler(has_backends_ ? std::vector<std::string>{"bench"} : std::vector<std::string>{});
    }
    Error sendMessage(std::uint16_t, std::uint16_t, const MessageDict& payload) override {
      benchmark::DoNotOptimize(payload.size());
      return std::nullopt;
    }
    void flushMessages() override {}
    std::string description() const override { return "bench"; }

   private:
    bool has_backends_;
  };

  bool has_backends_;
};

// The calling thread's share: copying the record and posting it.
void HandOver(benchmark::State& state) {
  constexpr int kMessages = 10'000;
  const LogChannels silent{nullptr};
  CountingBackend backend(state.range(0) != 0);
  ElasticQueuePool pool({.most_threads = 2, .most_waiting = 1'000'000});
  const auto queue = pool.makeQueue("bench");
  const auto traffic = std::make_shared<CallstatTraffic>(
      CallstatTraffic::Dependencies{.backend = backend, .log = silent.callstat, .queue = queue});
  traffic->start({.reporter_id = 7, .service_name = "bench", .configuration = {}});
  std::vector<TalReportingSessionMessage::Pointer> records;
  for (int i = 0; i < kMessages; ++i) {
    records.push_back(TalReportingSessionMessage::initWithMessage(
        twelveKeys(i), AudioEventCategory::kPlayback, AudioEventType::kStart));
  }
  for (auto _ : state) {
    for (const auto& record : records) {
      traffic->deliver(
          TalReportingSessionMessage::initWithMessage(record->message(), record->category(), record->type()));
    }
    state.PauseTiming();
    std::atomic<bool> drained = false;
    queue->post([&drained] { drained = true; });
    while (!drained) std::this_thread::yield();
    state.ResumeTiming();
  }
  traffic->abandon();
  pool.stop();
  state.counters["cpu_per_million_messages"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * kMessages / 1e6,
                         benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(HandOver)->ArgName("backends")->Arg(1)->Arg(0)->Unit(benchmark::kMillisecond);

class BrokerSettings final : public SettingsStore {
 public:
  std::optional<MessageValue> value(std::string_view, std::string_view key) const override {
    if (key == "brokers") {
      return MessageValue(MessageArray{"mqtt://127.0.0.1:" + std::to_string(kBrokerPort)});
    }
    if (key == "max_mebibytes" || key == "outbox_mebibytes") return MessageValue(10'000);
    return std::nullopt;
  }
  bool setValue(std::string_view, std::string_view, const MessageValue&) override { return false; }
  void refresh(std::string_view) override {}
};

/// mosquitto on a loopback port, for as long as the object lives.
class LocalBroker {
 public:
  explicit LocalBroker(const std::filesystem::path& directory) {
    const std::string file = directory / "broker.conf";
    std::ofstream(file) << "listener " << kBrokerPort << " 127.0.0.1\nallow_anonymous true\nlog_dest none\n";
    std::string program = "mosquitto";
    std::string option = "-c";
    std::string path = file;
    char* arguments[] = {program.data(), option.data(), path.data(), nullptr};
    if (::posix_spawnp(&process_, "/usr/sbin/mosquitto", nullptr, nullptr, arguments, environ) != 0) {
      process_ = -1;
    }
  }
  LocalBroker(const LocalBroker&) = delete;
  LocalBroker& operator=(const LocalBroker&) = delete;
  ~LocalBroker() {
    if (process_ < 0) return;
    ::kill(process_, SIGTERM);
    ::waitpid(process_, nullptr, 0);
  }
  bool runs() const { return process_ > 0; }

 private:
  pid_t process_ = -1;
};

// From the full outbox to the empty one; connecting is part of it.
void OutboxDrains(benchmark::State& state) {
  constexpr int kMessages = 200'000;
  constexpr int kSessions = 20;
  const bool realtime = state.range(0) != 0;
  const BrokerSettings settings;
  const LinuxClock clock;
  const LogChannels silent{nullptr};
  for (auto _ : state) {
    std::string name = std::filesystem::temp_directory_path() / "rtc-bench-XXXXXX";
    if (!::mkdtemp(name.data())) std::abort();
    const std::filesystem::path directory = name;
    {
      StoreWriter store(
          {.directory = directory, .settings = settings, .clock = clock, .log = silent.service});
      {
        LinuxCallstatBackend backend({.store = store,
                                      .store_path = directory / "store.db",
                                      .settings = settings,
                                      .clock = clock,
                                      .log = silent.callstat});
        std::vector<std::unique_ptr<CallstatSession>> sessions;
        for (std::int64_t i = 0; i < kSessions; ++i) {
          sessions.push_back(backend.initWithSessionInfo(
              {{"session_identifier", i}, {"contains_real_time_events", realtime}},
              {{"client_name", "bench"}}, {}));
          sessions.back()->startConfigurationWithCompletionHandler([](const auto&) {});
        }
        backend.stop();  // nobody sends while it fills
        for (int i = 0; i < kMessages; ++i) {
          sessions[static_cast<std::size_t>(i % kSessions)]->sendMessage(4, 1, twelveKeys(i));
          while (store.overBound()) std::this_thread::yield();
        }
      }
      store.commitNow(1min);
      const LocalBroker broker(directory);
      if (!broker.runs()) {
        state.SkipWithError("mosquitto is not installed");
        break;
      }
      std::this_thread::sleep_for(500ms);  // until it listens
      SqliteConnection reader(directory / "store.db", SqliteConnection::Access::kReadOnly);
      const std::int64_t waiting = reader.integer("SELECT count(*) FROM rtc_outbox");
      if (waiting != kMessages) state.SkipWithError("messages are missing in the outbox");
      const auto begin = std::chrono::steady_clock::now();
      LinuxCallstatBackend backend({.store = store,
                                    .store_path = directory / "store.db",
                                    .settings = settings,
                                    .clock = clock,
                                    .log = silent.callstat});
      while (reader.integer("SELECT count(*) FROM (SELECT 1 FROM rtc_outbox LIMIT 1)") > 0) {
        std::this_thread::sleep_for(5ms);
      }
      state.SetIterationTime(std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count());
      backend.stop();
    }
    std::filesystem::remove_all(directory);
  }
  state.counters["messages_per_second"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * kMessages, benchmark::Counter::kIsRate);
}
BENCHMARK(OutboxDrains)
    ->ArgName("realtime")
    ->Arg(0)
    ->Arg(1)
    ->UseManualTime()
    ->Iterations(1)
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
