#include "daemon/Daemon.h"

#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <future>
#include <utility>

#include "platform/linux/ipc/IpcSettings.h"
#include "platform/linux/ipc/ServiceManager.h"
#include "platform/linux/logging/JournalLogSink.h"
#include "platform/linux/logging/RepeatedLines.h"
#include "platform/linux/process/StartupError.h"
#include "service/WorkerRosterTable.h"

namespace tal {

namespace {

constexpr int kExitKilled = 2;
constexpr std::string_view kCaptureQueueLabel = "org.vantle.talsys.reporting.capture";
// Files are the daemon's user's and group's.
constexpr mode_t kFileMask = 0027;
// Descriptors that are not clients: the store, logs, event queues.
constexpr rlim_t kOwnDescriptors = 64;

std::optional<std::string> fromEnvironment(const char* name) {
  const char* value = std::getenv(name);
  return value && *value != '\0' ? std::optional<std::string>(value) : std::nullopt;
}

Directories preparedDirectories(const DaemonOptions& options) {
  ::umask(kFileMask);
  Directories directories = chooseDirectories(options.directories, ::geteuid() == 0, fromEnvironment);
  makeDirectories(directories);
  return directories;
}

std::unique_ptr<LogSink> makeLogSink(DaemonOptions::LogTo log_to) {
  if (log_to == DaemonOptions::LogTo::kStderr) return std::make_unique<StderrLogSink>();
  auto journal = makeJournalLogSink();
  if (!journal) throw StartupError("built without the system journal: use --log-to stderr");
  return journal;
}

// As many files as clients may connect, as far as the hard limit goes.
void raiseDescriptorLimit(std::size_t connections) {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  const rlim_t wanted = connections + kOwnDescriptors;
  if (limit.rlim_cur >= wanted) return;
  limit.rlim_cur = std::min(wanted, limit.rlim_max);
  ::setrlimit(RLIMIT_NOFILE, &limit);
}

}  // namespace

Daemon::Daemon(const DaemonOptions& options, const std::string& version)
    : directories_(preparedDirectories(options)),
      lock_(directories_.state),
      log_sink_(std::make_unique<RepeatedLines>(makeLogSink(options.log_to), clock_)),
      startup_log_(log_sink_.get(), options.log_level),
      device_properties_(directories_.config, startup_log_.service),
      internal_build_(TalReportingUtilityIsInternalBuild(device_properties_)),
      log_ring_(internal_build_ ? std::make_unique<LogRing>(*log_sink_, options.log_level) : nullptr),
      log_(log_ring_ ? log_ring_.get() : log_sink_.get(), log_ring_ ? LogLevel::kDebug : options.log_level),
      settings_({.config_directory = directories_.config,
                 .state_directory = directories_.state,
                 .clock = clock_,
                 .log = log_.service}),
      store_({.directory = directories_.state, .settings = settings_, .clock = clock_, .log = log_.service}),
      analytics_({.store = store_,
                  .clock = clock_,
                  .wanted = {.settings = settings_, .log = log_.service, .coarse_now = LinuxClock::coarse}}),
      plume_metrics_(store_, clock_),
      energylog_(store_, clock_),
      callstat_({.store = store_,
                 .store_path = directories_.state / "store.db",
                 .settings = settings_,
                 .clock = clock_,
                 .log = log_.callstat}),
      bluetooth_(makeLinuxBluetoothDevices(directories_.state)),
      durability_gate_(store_, queue_pool_),
      notify_center_(directories_.runtime, log_.service),
      system_state_(clock_, options.host_root),
      diagnostic_log_(directories_.log),
      driver_stats_(
          {.config_directory = directories_.config, .log = log_.driver_utility, .root = options.host_root}),
      no_flutter_requests_(log_.flutter),
      tap_to_kite_({.diagnostic_log = diagnostic_log_,
                    .clock = clock_,
                    .log = log_.session,
                    .program = "talreportingd " + version}),
      command_shell_(LinuxCommandShell::ownProgramDirectory()),
      tracing_({.log_directory = directories_.log,
                .runtime_directory = directories_.runtime,
                .diagnostic_log = diagnostic_log_,
                .clock = clock_,
                .log = log_.trace}),
      queue_(kReportingServerQueueLabel),
      capture_queue_(internal_build_ ? std::make_unique<ReportingQueue>(kCaptureQueueLabel,
                                                                        ReportingQueue::kBackgroundNiceness)
                                     : nullptr),
      captures_(capture_queue_ ? makeCaptureService() : nullptr),
      platform_{.reporting_queue = queue_,
                .clock = clock_,
                .log = log_,
                .trace_points = trace_points_,
                .device_properties = device_properties_,
                .settings = settings_,
                .notify_center = notify_center_,
                .processes = processes_,
                .analytics = analytics_,
                .plume_metrics = plume_metrics_,
                .energylog = energylog_,
                .system_state = system_state_,
                .diagnostic_log = diagnostic_log_,
                .driver_stats = driver_stats_,
                .queue_pool = queue_pool_,
                .callstat = callstat_,
                .bluetooth = *bluetooth_,
                .flutter_requests = flutterRequests(),
                .tap_to_kite = tap_to_kite_,
                .command_shell = command_shell_,
                .symptom_reporters = captures_.get(),
                .internal_build = internal_build_,
                .tracing = &tracing_.platform()},
      system_monitor_(platform_),
      roster_(makeWorkerRoster(platform_, system_monitor_)),
      service_(platform_, *roster_, system_monitor_, serviceOptions()),
      listener_(service_, durability_gate_, listeningSocket(), "talreportingd " + version),
      signals_(signal_context_, SIGTERM, SIGINT) {
  // A client or a log reader that goes away is an error of one write, no more.
  std::signal(SIGPIPE, SIG_IGN);
  raiseDescriptorLimit(readIpcSettings(settings_).max_connections);
}

FlutterRequestService& Daemon::flutterRequests() {
  if (captures_) return *captures_;
  return no_flutter_requests_;
}

std::unique_ptr<CaptureService> Daemon::makeCaptureService() {
  auto writer =
      std::make_shared<const CaptureWriter>(CaptureWriter::Dependencies{.log_directory = directories_.log,
                                                                        .state_directory = directories_.state,
                                                                        .clock = clock_,
                                                                        .settings = settings_,
                                                                        .log_ring = *log_ring_,
                                                                        .log = log_.hound});
  return std::make_unique<CaptureService>(
      CaptureService::Dependencies{.reporting_queue = queue_,
                                   .work_queue = *capture_queue_,
                                   .clock = clock_,
                                   .settings = settings_,
                                   .processes = processes_,
                                   .log = log_.hound,
                                   .writer = std::move(writer),
                                   .client_processes = [this] { return clientProcesses(); }});
}

std::vector<std::int32_t> Daemon::clientProcesses() const {
  std::vector<std::int32_t> processes;
  for (const auto& client : service_.getAllClients()) processes.push_back(client->processIdentifier());
  return processes;
}

ListeningSocket Daemon::listeningSocket() const {
  if (auto inherited = takeInheritedSocket()) return ListeningSocket(std::move(*inherited));
  return ListeningSocket(directories_.socket());
}

TalReportingService::Options Daemon::serviceOptions() {
  return {.end_process = [this] { endProcess(); },
          .max_kept_bytes = readIpcSettings(settings_).max_kept_bytes};
}

// On the I/O thread, while others run on: no destructor may run.
void Daemon::endProcess() {
  queue_pool_.stop();
  callstat_.stop();
  store_.flushAndClose();
  ::_exit(kExitKilled);
}

void Daemon::run() {
  signals_.async_wait([](const asio::error_code&, int) {});
  listener_.start();
  tellServiceManagerReady();
  signal_context_.run();
  tellServiceManagerStopping();
  endInOrder();
}

void Daemon::endInOrder() {
  listener_.drain();
  std::promise<void> stopped;
  queue_.post([this, &stopped] {
    service_.stopAllSessions();
    stopped.set_value();
  });
  stopped.get_future().wait();
  // Captures that were asked for are still written; timed ones are not waited for.
  if (capture_queue_) capture_queue_->stop();
  queue_pool_.stop();
  callstat_.stop();
  store_.flushAndClose();
  listener_.stop();
  queue_.stop();
}

}  // namespace tal
