// What the reporting queue's own work costs, in process: intake of a message,
// memory of a kept one, stop of a long session, its file, life of a short one.

#include <benchmark/benchmark.h>
#include <malloc.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "core/DictShape.h"
#include "platform/Platform.h"
#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"
#include "platform/linux/logging/LogRing.h"
#include "service/WorkerRosterTable.h"
#include "session/TalReportingSession.h"
#include "system/TalReportingSystemMonitor.h"
#include "workers/diagnostics/TalReportingSessionHoundWorker.h"
#include "workers/sinks/TalReportingSessionSummaryJsonFileWorker.h"

namespace tal {
namespace {

class NoQueue final : public SerialQueue {
 public:
  void post(Task) override {}
  void postAfter(std::chrono::nanoseconds, Task) override {}
  bool isCurrent() const override { return true; }
};

class SystemClock final : public Clock {
 public:
  double secondsSince1970() const override {
    return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  }
  Instant monotonic() const override { return std::chrono::steady_clock::now().time_since_epoch(); }
  TimeReading read() const override { return {secondsSince1970(), 0, 0}; }
  std::string localTimeForFileName() const override { return "20260131-144502+0000"; }
  void sleepFor(std::chrono::nanoseconds) const override {}
};

class NoTrace final : public TracePoints {
 public:
  void emit(TraceCode) override {}
};

/// Has all properties or none.
class Device final : public DeviceProperties {
 public:
  explicit Device(bool internal_build) : internal_build_(internal_build) {}
  std::optional<bool> booleanProperty(std::string_view) const override { return internal_build_; }

 private:
  const bool internal_build_;
};

class NoSettings final : public SettingsStore {
 public:
  std::optional<MessageValue> value(std::string_view, std::string_view) const override {
    return std::nullopt;
  }
  void refresh(std::string_view) override {}
  bool setValue(std::string_view, std::string_view, const MessageValue&) override { return false; }
};

class NoNotifications final : public NotifyCenter {
 public:
  Registration registerDispatch(std::string_view, SerialQueue&, Handler) override { return {}; }
  State getState(Token) override { return {}; }
  NotifyStatus cancel(Token) override { return NotifyStatus::kInvalidToken; }
  NotifyStatus post(std::string_view, std::optional<std::uint64_t>) override { return NotifyStatus::kFailed; }
};

class NoProcesses final : public ProcessTable {
 public:
  std::optional<std::string> processName(std::int32_t) const override { return std::nullopt; }
  std::int32_t ownProcessIdentifier() const override { return 1; }
};

/// Nobody consumes any event; one hash look-up per name, as on a device.
class NothingWanted final : public AnalyticsSink {
 public:
  bool eventIsWanted(std::string_view name) override {
    ++asked;
    const auto found = known_.find(std::hash<std::string_view>{}(name));
    if (found == known_.end()) known_.emplace(std::hash<std::string_view>{}(name), false);
    return found != known_.end() && found->second;
  }
  void sendEventWithPayloadProvider(std::string_view, const PayloadProvider&) override {}

  std::size_t asked = 0;

 private:
  std::unordered_map<std::size_t, bool> known_;
};

class NoMetrics final : public PlumeMetricSubmitter {
 public:
  void postMetric(std::uint32_t, const ProtobufMessage&) override {}
};

class NoEnergylog final : public EnergylogSink {
 public:
  void logRegisteredEvent(std::int32_t, std::string_view, const MessageDict&) override {}
};

class CalmDevice final : public SystemState {
 public:
  int thermalState() const override { return 0; }
  bool lowPowerModeIsOn() const override { return false; }
  Footprint physicalFootprint() const override { return {.bytes = 0, .error = ""}; }
  std::array<double, 3> loadAverages() const override { return {}; }
};

class NoDiagnosticLog final : public DiagnosticLog {
 public:
  std::string pathOf(std::string_view place) const override { return std::string(place); }
  DiagnosticFile::Error makeDirectory(std::string_view) override { return std::nullopt; }
  Opened createFile(std::string_view, std::string_view) override { return {nullptr, "none here"}; }
  DiagnosticFile::Error putFile(std::string_view, std::string_view, std::string_view) override {
    return "none here";
  }
  void keepLast(std::string_view, std::size_t) override {}
};

class NoDrivers final : public DriverStatsFeed {
 public:
  Result<DriverStatsChannelSet> copyChannels(const std::optional<std::string>&,
                                             const std::optional<std::string>&) override {
    return {};
  }
  Subscribed createSubscription(const DriverStatsChannelSet&) override { return {}; }
  Result<SampleSetPointer> createSamples(const DriverStatsSubscription&) override { return {}; }
  Result<std::vector<DriverStatsChannel>> createSamplesDelta(const DriverStatsSampleSet*,
                                                             const DriverStatsSampleSet&) override {
    return {};
  }
};

class NoFlutterRequests final : public FlutterRequestService {
 public:
  void requestFlutter(FlutterRequest) override {}
};

class NoCaptures final : public SymptomReporterFactory {
 public:
  std::shared_ptr<SymptomReporterService> makeClient(SymptomContext) override { return nullptr; }
};

class NoTapToKite final : public TapToKiteService {
 public:
  void createDraft(KiteDraft, std::optional<std::string>, std::string, Completion) override {}
};

class NoCommandShell final : public CommandShell {
 public:
  bool run(const std::string&, const Output&) override { return false; }
};

/// Queues that forget what they are given: what is measured is the handing over.
class NoQueues final : public SerialQueuePool {
 public:
  std::shared_ptr<SerialQueue> makeQueue(std::string_view) override { return std::make_shared<NoQueue>(); }
};

class NoCallstat final : public CallstatBackend {
 public:
  std::optional<CallstatToken> newHierarchyTokenFromParentToken(const CallstatToken*) override {
    return std::nullopt;
  }
  std::unique_ptr<CallstatSession> initWithSessionInfo(MessageDict, MessageDict,
                                                       const std::vector<std::string>&) override {
    return nullptr;
  }
};

class NoBluetooth final : public BluetoothDevices {
 public:
  Listing pairedDevices() override { return {.devices = {}, .unavailable = "none here"}; }
};

struct Host {
  NoQueue queue;
  SystemClock clock;
  LogChannels log;
  NoTrace trace;
  Device device;
  NoSettings settings;
  NoNotifications notify_center;
  NoProcesses processes;
  NothingWanted analytics;
  NoMetrics plume_metrics;
  NoEnergylog energylog;
  CalmDevice system_state;
  NoDrivers driver_stats;
  NoDiagnosticLog no_diagnostic_log;
  DiagnosticLog& diagnostic_log = no_diagnostic_log;
  NoFlutterRequests flutter_requests;
  NoTapToKite tap_to_kite;
  NoCommandShell command_shell;
  NoCaptures captures;
  NoQueues queue_pool;
  NoCallstat callstat;
  NoBluetooth bluetooth;
  Platform platform{.reporting_queue = queue,
                    .clock = clock,
                    .log = log,
                    .trace_points = trace,
                    .device_properties = device,
                    .settings = settings,
                    .notify_center = notify_center,
                    .processes = processes,
                    .analytics = analytics,
                    .plume_metrics = plume_metrics,
                    .energylog = energylog,
                    .system_state = system_state,
                    .diagnostic_log = diagnostic_log,
                    .driver_stats = driver_stats,
                    .queue_pool = queue_pool,
                    .callstat = callstat,
                    .bluetooth = bluetooth,
                    .flutter_requests = flutter_requests,
                    .tap_to_kite = tap_to_kite,
                    .command_shell = command_shell,
                    .symptom_reporters = &captures,
                    .internal_build = TalReportingUtilityIsInternalBuild(device)};
  TalReportingSystemMonitor system_monitor{platform};
  std::unique_ptr<WorkerRoster> roster = makeWorkerRoster(platform, system_monitor);
  std::size_t kept_bytes = 0;

  explicit Host(bool internal_build = false, LogSink* sink = nullptr)
      : log(sink, LogLevel::kDebug), device(internal_build) {
    system_monitor.initializeWithQueue(queue);
  }
  explicit Host(DiagnosticLog& log_directory) : log(nullptr), device(false), diagnostic_log(log_directory) {
    system_monitor.initializeWithQueue(queue);
  }

  std::unique_ptr<TalReportingSession> makeSession() {
    return std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {1}}, platform, *roster,
        kept_bytes);
  }
};

/// Twelve keys that share one shape, as the decoder makes them from a client's
/// messages; each differs from the one before.
class MessageMaker {
 public:
  /// `duration_key` names the ninth value.
  explicit MessageMaker(MessageKey duration_key = "session_duration") {
    std::array keys = kKeys;
    keys[8] = duration_key;
    shape_ = DictShape::make(keys);
  }

  MessageDict make() {
    ++number_;
    const double now = 1.8e9 + static_cast<double>(number_) * 0.001;
    MessageValue values[] = {number_ % 2 == 0, 0.4,   "Built-in Audio Stereo",
                             "S16LE 44100 Hz", "raw", 2,
                             number_,          now,   0.25,
                             "overload",       256,   number_ * 3};
    return {shape_, values};
  }

 private:
  static constexpr std::array<MessageKey, 12> kKeys = {"session_output_running",
                                                       "RvSessionVolume",
                                                       "active_devices",
                                                       "session_selected_format",
                                                       "mFormatID",
                                                       "mChannelsPerFrame",
                                                       "stretch_index",
                                                       "talreporting_timestamp",
                                                       "session_duration",
                                                       "issue_type",
                                                       "smallest_buffer_frame_size",
                                                       "io_cycle"};
  DictShape::Pointer shape_;
  std::int64_t number_ = 0;
};

void send(TalReportingSession& session, MessageMaker& maker) {
  session.sendMessage(TalReportingSessionMessage::initWithMessage(maker.make(), AudioEventCategory::kPlayback,
                                                                  AudioEventType::kGeneric));
}

void Intake(benchmark::State& state) {
  Host host;
  MessageMaker maker;
  constexpr int kMessages = 10'000;
  for (auto _ : state) {
    state.PauseTiming();
    auto session = host.makeSession();
    session->setServiceType(AudioServiceType::kLongformaudio);
    session->start();
    std::vector<MessageDict> messages;
    messages.reserve(kMessages);
    for (int i = 0; i < kMessages; ++i) messages.push_back(maker.make());
    state.ResumeTiming();
    for (MessageDict& message : messages) {
      session->sendMessage(TalReportingSessionMessage::initWithMessage(
          std::move(message), AudioEventCategory::kPlayback, AudioEventType::kGeneric));
    }
    state.PauseTiming();
    messages.clear();
    session.reset();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * kMessages);
  // Seconds for a million messages are microseconds for one.
  state.counters["per_million_messages"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * kMessages / 1e6,
                         benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(Intake)->Unit(benchmark::kMillisecond);

void StopAfterMessages(benchmark::State& state) {
  Host host;
  MessageMaker maker;
  double bytes_per_message = 0;
  for (auto _ : state) {
    state.PauseTiming();
    auto session = host.makeSession();
    session->start();
    const auto before = mallinfo2();
    for (std::int64_t i = 0; i < state.range(0); ++i) send(*session, maker);
    const auto after = mallinfo2();
    bytes_per_message = static_cast<double>(after.uordblks + after.hblkhd - before.uordblks - before.hblkhd) /
                        static_cast<double>(state.range(0));
    state.ResumeTiming();
    session->stop();
  }
  state.counters["bytes_per_kept_message"] = bytes_per_message;
}
BENCHMARK(StopAfterMessages)->Arg(10'000)->Arg(100'000)->Arg(1'000'000)->Unit(benchmark::kMillisecond);

// A message a second; every hundredth begins a playing stretch of 50 seconds. "session_duration", which would
// end one, bears another name here.
void sendStretches(TalReportingSession& session, MessageMaker& maker, std::int64_t count) {
  constexpr int kStretchEvery = 100;
  for (std::int64_t i = 0; i < count; ++i) {
    MessageDict message = maker.make();
    message.set("session_output_running", i % kStretchEvery < kStretchEvery / 2);
    message.set("talreporting_timestamp", 1.8e9 + static_cast<double>(i));
    session.sendMessage(TalReportingSessionMessage::initWithMessage(
        std::move(message), AudioEventCategory::kPlayback, AudioEventType::kGeneric));
  }
}

void StopAfterStretches(benchmark::State& state) {
  Host host;
  MessageMaker maker("seconds_so_far");
  std::size_t derived = 0;
  for (auto _ : state) {
    state.PauseTiming();
    auto session = host.makeSession();
    session->setServiceType(AudioServiceType::kLongformaudio);
    session->start();
    sendStretches(*session, maker, state.range(0));
    const std::size_t before = host.analytics.asked;
    state.ResumeTiming();
    session->stop();
    derived = host.analytics.asked - before;
  }
  state.counters["derived_messages"] = static_cast<double>(derived);
}
BENCHMARK(StopAfterStretches)->Arg(10'000)->Arg(100'000)->Arg(1'000'000)->Unit(benchmark::kMillisecond);

// The number behind a word of /proc/self/status, in mebibytes.
double mebibytesOf(const std::string& field) {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;) {
    double kibibytes = 0;
    if (word == field && status >> kibibytes) return kibibytes / 1024;
  }
  return 0;
}

void resetPeakMemory() { std::ofstream("/proc/self/clear_refs") << "5"; }

void SessionFile(benchmark::State& state) {
  namespace fs = std::filesystem;
  const fs::path root = fs::temp_directory_path() / ("tal-session-file-" + std::to_string(getpid()));
  fs::create_directories(root);
  LinuxDiagnosticLog files(root);
  Host host(files);
  MessageMaker maker;
  auto session = host.makeSession();
  session->setServiceType(AudioServiceType::kTest);
  for (std::int64_t i = 0; i < state.range(0); ++i) send(*session, maker);
  TalReportingSessionSummaryJsonFileWorkerClass file_class;
  std::uintmax_t bytes = 0;
  double more_memory = 0;
  for (auto _ : state) {
    const auto worker = file_class.initWithSession(*session);
    resetPeakMemory();
    const double before = mebibytesOf("VmHWM:");
    worker->stop();
    state.PauseTiming();
    more_memory = std::max(more_memory, mebibytesOf("VmHWM:") - before);
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
      if (entry.is_regular_file()) bytes += entry.file_size();
    }
    fs::remove_all(root / "Audio");
    state.ResumeTiming();
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(bytes));
  state.counters["more_MiB_at_peak"] = more_memory;
  fs::remove_all(root);
}
BENCHMARK(SessionFile)->Arg(1'000'000)->Unit(benchmark::kMillisecond);

void SessionLife(benchmark::State& state) {
  Host host;
  for (auto _ : state) {
    auto session = host.makeSession();
    session->setServiceType(AudioServiceType::kLongformaudio);
    session->start();
    session->stop();
  }
}
BENCHMARK(SessionLife)->Unit(benchmark::kMicrosecond);

void StartedSessions(benchmark::State& state) {
  Host host;
  constexpr int kSessions = 10'000;
  double bytes = 0;
  for (auto _ : state) {
    std::vector<std::unique_ptr<TalReportingSession>> sessions;
    sessions.reserve(kSessions);
    const auto before = mallinfo2();
    for (int i = 0; i < kSessions; ++i) {
      sessions.push_back(host.makeSession());
      sessions.back()->start();
    }
    bytes = static_cast<double>(mallinfo2().uordblks - before.uordblks) / kSessions;
  }
  state.counters["bytes_per_started_session"] = bytes;
}
BENCHMARK(StartedSessions)->Unit(benchmark::kMillisecond);

// What the bug-capture worker costs a message that no instance is interested in,
// with one haptic leak counted already, so that payloads are compared as well.
void BugCaptureUninterested(benchmark::State& state) {
  Host host(/*internal_build=*/true);
  MessageMaker maker;
  TalReportingSessionHoundWorkerClass worker_class;
  const auto session = host.makeSession();
  const auto worker = worker_class.initWithSession(*session);
  TalReportingSessionWorkerConsumer& consumer = *worker->asConsumer();
  const auto record = [](MessageDict dict, AudioEventType type) {
    return TalReportingSessionMessage::initWithMessage(std::move(dict), AudioEventCategory::kPlayback, type);
  };
  MessageDict leak = maker.make();
  leak.set("Haptic_Active_Hardware_Time_Seconds", 1);
  consumer.handleMessage(record(std::move(leak), AudioEventType::kEnergylog));
  std::vector<TalReportingSessionMessage::Pointer> messages;
  for (int i = 0; i < 1000; ++i) messages.push_back(record(maker.make(), AudioEventType::kGeneric));
  for (auto _ : state) {
    for (const auto& message : messages) consumer.handleMessage(message);
  }
  state.counters["per_message"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * static_cast<double>(messages.size()),
                         benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(BugCaptureUninterested);

class NoLog final : public LogSink {
 public:
  void write(std::string_view, LogLevel, std::string_view) override {}
};

// What a message's intake costs an internal build, which keeps its last log lines.
void InternalBuildIntake(benchmark::State& state) {
  NoLog nowhere;
  LogRing ring(nowhere, LogLevel::kError);
  Host host(/*internal_build=*/true, state.range(0) != 0 ? &ring : nullptr);
  MessageMaker maker;
  auto session = host.makeSession();
  session->setServiceType(AudioServiceType::kLongformaudio);
  session->start();
  for (auto _ : state) send(*session, maker);
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(InternalBuildIntake)->ArgName("ring")->Arg(0)->Arg(1)->Iterations(200'000);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
