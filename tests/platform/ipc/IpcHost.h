#pragma once

// A real listener over a real service on a real queue, in a directory of its
// own; only the store and the sink for events are the test's.

#include <algorithm>
#include <atomic>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/ipc/WireClient.h"
#include "platform/linux/ipc/IpcListener.h"
#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/process/LinuxProcessTable.h"
#include "platform/linux/process/ReportingQueue.h"
#include "service/WorkerRosterTable.h"
#include "support/FakeDurabilityGate.h"
#include "support/TestPlatform.h"

namespace tal::test {

/// Every event is a row, and keeps the number "n" of its message. Lives on the queue.
class RowPerEvent final : public AnalyticsSink {
 public:
  explicit RowPerEvent(FakeDurabilityGate& gate) : gate_(gate) {}

  bool eventIsWanted(std::string_view name) override {
    return wanted && name.starts_with("org.vantle.talsys.");
  }
  void sendEventWithPayloadProvider(std::string_view, const PayloadProvider& provider) override {
    const MessageDict payload = provider();
    if (const MessageValue* number = payload.find("n")) numbers.push_back(number->toInt64());
    gate_.appendRow();
  }

  std::atomic<bool> wanted{true};
  std::vector<std::int64_t> numbers;

 private:
  FakeDurabilityGate& gate_;
};

class SharedLog final : public LogSink {
 public:
  void write(std::string_view, LogLevel, std::string_view line) override {
    const std::lock_guard lock(mutex_);
    lines_ += line;
    lines_ += '\n';
  }
  bool holds(std::string_view text) { return count(text) != 0; }
  std::size_t count(std::string_view text) {
    const std::lock_guard lock(mutex_);
    std::size_t found = 0;
    for (std::size_t at = 0; (at = lines_.find(text, at)) != std::string::npos; ++at) ++found;
    return found;
  }

 private:
  std::mutex mutex_;
  std::string lines_;
};

class IpcHost {
 public:
  IpcHost() {
    // Other users connect as well.
    using std::filesystem::perms;
    std::filesystem::permissions(directory.path(), perms::owner_all | perms::group_exec | perms::others_exec);
  }
  ~IpcHost() {
    unblockQueue();
    if (listener) listener->stop();
    queue.stop();
  }

  void setting(std::string_view key, const MessageValue& value) {
    settings.setValue(kIpcSettingsDomain, key, value);
  }
  void start() {
    listener = std::make_unique<IpcListener>(service, gate, ListeningSocket(socketPath()), "test 1");
    listener->start();
  }
  std::filesystem::path socketPath() const { return directory.path() / "socket"; }
  std::unique_ptr<WireClient> connect() { return std::make_unique<WireClient>(socketPath()); }

  /// Waits until the queue has run what is posted, and returns what the sink has.
  std::vector<std::int64_t> numbersCarriedOut() {
    std::promise<std::vector<std::int64_t>> numbers;
    queue.post([&] { numbers.set_value(sink.numbers); });
    return numbers.get_future().get();
  }

  /// What was sent to the listener before has been read when this returns, as
  /// far as it is read at all.
  void letListenerCatchUp() {
    // The events of one wait come in any order; those of the next come after them.
    for (int wait = 0; wait < 2; ++wait) {
      const std::size_t before = log_sink.count("newConnection");
      const auto connection = connect();
      while (log_sink.count("newConnection") == before) std::this_thread::yield();
    }
  }

  /// Nothing is carried out until `unblockQueue`.
  void blockQueue() {
    std::promise<void> blocked;
    unblock_ = std::make_unique<std::promise<void>>();
    queue.post([&blocked, until = std::make_shared<std::future<void>>(unblock_->get_future())] {
      blocked.set_value();
      until->wait();
    });
    blocked.get_future().wait();
  }
  void unblockQueue() {
    if (const auto unblock = std::move(unblock_)) unblock->set_value();
  }

  TemporaryDirectory directory;
  SharedLog log_sink;
  LogChannels log{&log_sink};
  LinuxClock clock;
  LinuxProcessTable processes;
  RecordingTracePoints trace_points;
  FakeDeviceProperties device_properties;
  FakeSettings settings;
  FakeNotifyCenter notify_center;
  FakeDurabilityGate gate;
  RowPerEvent sink{gate};
  RecordingPlumeMetrics plume_metrics;
  RecordingEnergylog energylog;
  FakeSystemState system_state;
  FakeDiagnosticLog diagnostic_log;
  FakeDriverStatsFeed driver_stats;
  FakeFlutterRequestService flutter_requests;
  FakeTapToKiteService tap_to_kite;
  FakeCommandShell command_shell;
  HandClock idle_clock;
  HandQueuePool queue_pool{idle_clock};
  FakeCallstatBackend callstat;
  FakeBluetoothDevices bluetooth;
  ReportingQueue queue{"test"};
  Platform platform{.reporting_queue = queue,
                    .clock = clock,
                    .log = log,
                    .trace_points = trace_points,
                    .device_properties = device_properties,
                    .settings = settings,
                    .notify_center = notify_center,
                    .processes = processes,
                    .analytics = sink,
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
                    .command_shell = command_shell};
  TalReportingSystemMonitor system_monitor{platform};
  std::unique_ptr<WorkerRoster> roster = makeWorkerRoster(platform, system_monitor);
  std::promise<void> killed;
  TalReportingService service{
      platform, *roster, system_monitor, {.end_process = [this] { killed.set_value(); }}};
  std::unique_ptr<IpcListener> listener;

 private:
  std::unique_ptr<std::promise<void>> unblock_;
};

/// A message that the sink tells from others by its number.
inline std::string message(int call, int number, const std::vector<int>& receivers) {
  return request(Operation::kSendMessage, call, MessageDict{{"n", number}}, 4, 1, receivers);
}

/// The session takes messages.
inline void startSession(WireClient& client, int reporter_id) {
  client.send(request(Operation::kCreateReportingSession, 0, reporter_id));
  client.send(request(Operation::kSetServiceType, 0, 7, reporter_id));
  client.send(request(Operation::kStartReportingSessionForID, 0, reporter_id));
}

}  // namespace tal::test
