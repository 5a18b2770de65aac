#pragma once

#include "core/Log.h"
#include "platform/AnalyticsSink.h"
#include "platform/BluetoothDevices.h"
#include "platform/CallstatBackend.h"
#include "platform/Clock.h"
#include "platform/CommandShell.h"
#include "platform/DeviceProperties.h"
#include "platform/DiagnosticLog.h"
#include "platform/DriverStatsFeed.h"
#include "platform/EnergylogSink.h"
#include "platform/FlutterRequestService.h"
#include "platform/NotifyCenter.h"
#include "platform/PlumeMetricSubmitter.h"
#include "platform/ProcessTable.h"
#include "platform/SerialQueue.h"
#include "platform/SerialQueuePool.h"
#include "platform/SettingsStore.h"
#include "platform/SymptomReporterService.h"
#include "platform/SystemState.h"
#include "platform/TapToKiteService.h"
#include "platform/TracePoints.h"
#include "platform/TracingPlatform.h"

namespace tal {

/// Everything that the system needs of its host, made by `main` and handed down.
/// The bundle owns nothing; what it refers to outlives all who hold it.
struct Platform {
  SerialQueue& reporting_queue;
  const Clock& clock;
  const LogChannels& log;
  TracePoints& trace_points;
  const DeviceProperties& device_properties;
  SettingsStore& settings;
  NotifyCenter& notify_center;
  const ProcessTable& processes;
  AnalyticsSink& analytics;
  PlumeMetricSubmitter& plume_metrics;
  EnergylogSink& energylog;
  const SystemState& system_state;
  DiagnosticLog& diagnostic_log;
  DriverStatsFeed& driver_stats;
  SerialQueuePool& queue_pool;
  CallstatBackend& callstat;
  BluetoothDevices& bluetooth;
  FlutterRequestService& flutter_requests;
  TapToKiteService& tap_to_kite;
  CommandShell& command_shell;
  /// Null on a host that takes no captures, as on every customer build.
  SymptomReporterFactory* symptom_reporters = nullptr;
  /// `TalReportingUtilityIsInternalBuild`, asked once.
  bool internal_build = false;
  /// Null on a host that records no performance traces.
  const TracingPlatform* tracing = nullptr;
};

/// The label that the host's tools show for the reporting queue's thread.
inline constexpr std::string_view kReportingServerQueueLabel = "org.vantle.talsys.reporting.server";

/// The reporting queue: the one serial queue on which all operations of the
/// service, its sessions and their workers run.
inline SerialQueue& TalReportingUtilityGetReportingServerQueue(const Platform& platform) {
  return platform.reporting_queue;
}

}  // namespace tal
