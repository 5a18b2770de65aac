#pragma once

#include <filesystem>
#include <thread>
#include <vector>

#include "platform/Clock.h"
#include "platform/DiagnosticLog.h"
#include "platform/PerftrailService.h"

namespace tal {

class PerftrailRun;

/// Records with the tracer of user space, which a helper program drives: the
/// daemon's own environment and threads stay as they are. A trace is a directory
/// of its own in "Audio/Traces"; the newest eight are kept. Finished traces are
/// never compressed.
class LinuxPerftrailService final : public PerftrailService {
 public:
  struct Options {
    std::filesystem::path helper;
    /// Where a session daemon is started when the user runs none.
    std::filesystem::path home;
    DiagnosticLog& diagnostic_log;
    const Clock& clock;
  };

  explicit LinuxPerftrailService(Options options);
  LinuxPerftrailService(const LinuxPerftrailService&) = delete;
  LinuxPerftrailService& operator=(const LinuxPerftrailService&) = delete;
  /// Gives up what still runs and waits until it has ended.
  ~LinuxPerftrailService() override;

  std::unique_ptr<PerftrailConfiguration> makeConfiguration(
      PerftrailConfiguration::Template trace_template) override;
  std::shared_ptr<PerftrailSession> makeSession(const PerftrailConfiguration& configuration) override;

 private:
  class Session;
  struct Running {
    std::shared_ptr<PerftrailRun> run;
    std::thread thread;
  };
  void run(std::shared_ptr<PerftrailRun> run, PerftrailConfiguration::Template trace_template);
  void joinEnded();

  const Options options_;
  std::vector<Running> running_;
};

}  // namespace tal
