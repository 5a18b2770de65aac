#pragma once

// Records a performance trace while a test session runs on an internal build, and
// leaves the times of signposts and probes in a performance-data file (".pdj").

#include <chrono>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "platform/TracingPlatform.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"
#include "tracing/PerfSeries.h"

namespace tal {

/// Where traces and results go, below the diagnostic-log directory.
inline constexpr std::string_view TalReportingTraceLogsDirectory = "Audio/Traces";

/// The library's classes, each looked up once for all workers.
class SkeinClasses {
 public:
  explicit SkeinClasses(SkeinLibrary& library) : library_(library) {}

  SkeinTraceModelClass* traceModel();
  SkeinSignpostModelClass* signpostModel();
  SkeinProbeFactoryClass* probeFactory();

 private:
  SkeinLibrary& library_;
  std::optional<SkeinTraceModelClass*> trace_model_;
  std::optional<SkeinSignpostModelClass*> signpost_model_;
  std::optional<SkeinProbeFactoryClass*> probe_factory_;
};

/// What the trace service's thread and the reporting queue have in common. Any
/// thread. An object of its own, so that a late callback finds it alive.
class TraceEvents final : public PerftrailDelegate {
 public:
  /// `log` outlives it.
  TraceEvents(std::unique_ptr<CountingSemaphore> semaphore, const LogChannel& log)
      : semaphore_(std::move(semaphore)), log_(log) {}

  void perftrailDidStart(const Error& error) override;
  void perftrailDidStop(const Error& error) override;
  void perftrailDidComplete(const std::string& trace_url, std::string_view token,
                            const Error& error) override;

  /// Begins anew with these: nothing of an earlier recording is waited for.
  void begin(std::unique_ptr<PerftrailConfiguration> configuration,
             std::shared_ptr<PerftrailSession> session);
  /// Gives up what may still be recorded.
  void abandon();
  std::shared_ptr<PerftrailSession> traceSession() const;
  std::string finalTraceURL() const;
  bool wait(std::chrono::nanoseconds timeout) { return semaphore_->wait(timeout); }

 private:
  std::shared_ptr<PerftrailSession> takeSession();

  const std::unique_ptr<CountingSemaphore> semaphore_;
  const LogChannel& log_;
  mutable std::mutex mutex_;
  std::unique_ptr<PerftrailConfiguration> trace_config_;
  std::shared_ptr<PerftrailSession> trace_session_;
  std::string final_trace_url_;
};

/// Lives on the reporting queue, which `start` and `stop` keep waiting: up to 15
/// seconds for the trace to start, and up to 180 for it to be complete.
///
/// Life: not tracing -> tracing -> stopping -> results written -> not tracing.
class TalReportingSessionTraceWorker final : public TalReportingSessionWorker {
 public:
  /// All outlive the worker.
  TalReportingSessionTraceWorker(TalReportingSession& session, const TracingPlatform& tracing,
                                 SkeinClasses& skein);
  ~TalReportingSessionTraceWorker() override;

  std::optional<bool> start() override;
  void stop() override;

 private:
  const LogChannel& log() const { return session_.platform().log.trace; }
  std::string configured(const MessageKey& key) const;
  bool mayTrace() const;
  ClientFiles::Contents readProbeList() const;
  bool waitForStart();
  bool waitForEnd();
  std::chrono::nanoseconds endDelay() const;

  // Results.
  void processTraceSkein(const std::string& trace_url);
  std::vector<SkeinProbeDescription> collectProbes();
  std::vector<std::string> perfProcesses() const;
  std::unique_ptr<SkeinTraceModel> makeTraceModel(const std::string& trace_url);
  std::unique_ptr<SkeinSignpostModel> makeSignpostModel(const SkeinTraceModel& trace_model);
  bool createPDWriter();
  std::string outputFileName() const;
  void processSignposts(const SkeinSignpostModel& signpost_model);
  void processProbe(const SkeinProbe& probe);
  void writeResults();
  void dropWriter();

  TalReportingSession& session_;
  const TracingPlatform& tracing_;
  SkeinClasses& skein_;
  std::shared_ptr<TraceEvents> events_;  // from the first recording on: most sessions have none
  bool started_tracing_ = false;

  static constexpr int kResultsVersion = 4;
  std::string perf_data_name_ = "TalReporting";
  std::unique_ptr<ResultsDirectory> results_directory_;
  std::unique_ptr<PerfDataWriter> writer_;  // writes into the directory above
  std::string output_file_;
  std::string temp_writer_path_;
  std::string full_writer_path_;
  MessageDict key_variables_;
  double total_time_value_ = 0;
  std::vector<std::string> total_time_metrics_;
};

class TalReportingSessionTraceWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `tracing` outlives the class.
  explicit TalReportingSessionTraceWorkerClass(const TracingPlatform& tracing)
      : TalReportingSessionWorkerClass("TalReportingSessionTraceWorker", {}),
        tracing_(tracing),
        skein_(tracing.skein) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    return std::make_unique<TalReportingSessionTraceWorker>(session, tracing_, skein_);
  }

 private:
  const TracingPlatform& tracing_;
  SkeinClasses skein_;
};

}  // namespace tal
