#pragma once

// The whole system, put together: every object that lives as long as the
// process, in the order in which each needs those before it.

#include <asio/io_context.hpp>
#include <asio/signal_set.hpp>
#include <memory>
#include <string>

#include "core/Log.h"
#include "daemon/CommandLine.h"
#include "daemon/Directories.h"
#include "daemon/StoreDurabilityGate.h"
#include "platform/Platform.h"
#include "platform/linux/bluetooth/LinuxBluetoothDevices.h"
#include "platform/linux/callstat/LinuxCallstatBackend.h"
#include "platform/linux/capture/CaptureService.h"
#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"
#include "platform/linux/driver_stats/LinuxDriverStatsFeed.h"
#include "platform/linux/flutter/UnavailableFlutterRequestService.h"
#include "platform/linux/ipc/IpcListener.h"
#include "platform/linux/kite/LinuxTapToKiteService.h"
#include "platform/linux/logging/LogRing.h"
#include "platform/linux/logging/StderrLogSink.h"
#include "platform/linux/notify/LinuxNotifyCenter.h"
#include "platform/linux/process/ElasticQueuePool.h"
#include "platform/linux/process/InstanceLock.h"
#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/process/LinuxProcessTable.h"
#include "platform/linux/process/ReportingQueue.h"
#include "platform/linux/process/SdtTracePoints.h"
#include "platform/linux/settings/DeviceTomlProperties.h"
#include "platform/linux/settings/TomlSettings.h"
#include "platform/linux/shell/LinuxCommandShell.h"
#include "platform/linux/store/StoreAnalyticsSink.h"
#include "platform/linux/store/StoreEnergylogSink.h"
#include "platform/linux/store/StorePlumeMetricSubmitter.h"
#include "platform/linux/store/StoreWriter.h"
#include "platform/linux/system_state/LinuxSystemState.h"
#include "platform/linux/tracing/LinuxTracing.h"
#include "service/TalReportingService.h"
#include "session/WorkerRoster.h"
#include "system/TalReportingSystemMonitor.h"

namespace tal {

/// One per process; used by `main` alone.
class Daemon {
 public:
  /// Makes everything; nobody is served yet. Throws StartupError.
  Daemon(const DaemonOptions& options, const std::string& version);
  Daemon(const Daemon&) = delete;
  Daemon& operator=(const Daemon&) = delete;

  /// Serves clients until SIGTERM or SIGINT, then ends in order: what was
  /// received is carried out, sessions are stopped, the store is committed.
  void run();

 private:
  FlutterRequestService& flutterRequests();
  std::unique_ptr<CaptureService> makeCaptureService();
  std::vector<std::int32_t> clientProcesses() const;
  ListeningSocket listeningSocket() const;
  TalReportingService::Options serviceOptions();
  [[noreturn]] void endProcess();
  void endInOrder();

  const Directories directories_;
  const InstanceLock lock_;
  LinuxClock clock_;
  const std::unique_ptr<LogSink> log_sink_;
  // For what is read before it is known whether the build is internal.
  const LogChannels startup_log_;
  SdtTracePoints trace_points_;
  LinuxProcessTable processes_;
  DeviceTomlProperties device_properties_;
  const bool internal_build_;
  const std::unique_ptr<LogRing> log_ring_;  // null on a customer build
  const LogChannels log_;
  TomlSettings settings_;
  StoreWriter store_;
  StoreAnalyticsSink analytics_;
  StorePlumeMetricSubmitter plume_metrics_;
  StoreEnergylogSink energylog_;
  LinuxCallstatBackend callstat_;
  const std::unique_ptr<BluetoothDevices> bluetooth_;
  // Destroyed before what its queues' tasks use.
  ElasticQueuePool queue_pool_;
  StoreDurabilityGate durability_gate_;
  LinuxNotifyCenter notify_center_;
  LinuxSystemState system_state_;
  LinuxDiagnosticLog diagnostic_log_;
  LinuxDriverStatsFeed driver_stats_;
  UnavailableFlutterRequestService no_flutter_requests_;  // on a customer build
  LinuxTapToKiteService tap_to_kite_;
  LinuxCommandShell command_shell_;
  LinuxTracing tracing_;
  // Destroyed after the queue's thread, whose tasks use them, has ended.
  ReportingQueue queue_;
  // Null on a customer build. The work of the second runs on the first, and comes
  // back to the queue above, which outlives both.
  const std::unique_ptr<ReportingQueue> capture_queue_;
  const std::unique_ptr<CaptureService> captures_;
  const Platform platform_;
  TalReportingSystemMonitor system_monitor_;
  const std::unique_ptr<WorkerRoster> roster_;
  TalReportingService service_;
  IpcListener listener_;

  asio::io_context signal_context_{1};
  asio::signal_set signals_;
};

}  // namespace tal
