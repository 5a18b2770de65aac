// Keeps the reporter connected to PipeWire across its restarts.
#pragma once

#include <pipewire/pipewire.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "reporters/pipewire/PipeWireConnection.h"
#include "reporters/pipewire/RemoteSocket.h"
#include "reporters/pipewire/StreamReporter.h"

namespace tal {

/// Connects to PipeWire, and again whenever it was gone.
///
///  1. Try to connect. On success follow that PipeWire until it is lost, then begin again after a
///     pause, which is the shortest one where the connection lasted.
///  2. Else watch for the socket to appear, and meanwhile try a few times with growing pauses,
///     since it may have appeared before the watch began.
///  3. Then wait for the watch without waking up. Without a watch (the system can refuse it)
///     the longest pause repeats.
///
/// Lives on the main loop's thread. Loop, context and reporter outlive it.
class PipeWireConnector {
 public:
  struct Options {
    pw_loop* loop;
    pw_context* context;
    StreamReporter& reporter;
    std::vector<std::filesystem::path> socketPaths;
    std::function<void(const std::string& line)> onLogLine;
  };

  explicit PipeWireConnector(Options options);
  ~PipeWireConnector();
  PipeWireConnector(const PipeWireConnector&) = delete;
  PipeWireConnector& operator=(const PipeWireConnector&) = delete;

  /// The first attempt.
  void start();

 private:
  void attempt();
  void lost();
  void watch();
  void unwatch();
  void retryAfter(std::chrono::nanoseconds pause);

  /// Long enough not to count as one more failure.
  static constexpr std::chrono::seconds kLastingConnection{10};

  Options options_;
  ReconnectPacing pacing_;
  /// The present wait for PipeWire was logged.
  bool waitingLogged_ = false;
  /// PipeWire has answered on the present connection.
  bool ready_ = false;
  std::chrono::steady_clock::time_point connectedAt_;
  std::unique_ptr<PipeWireConnection> connection_;
  std::unique_ptr<PathWatch> watch_;
  spa_source* watchSource_ = nullptr;
  /// Carries the loss of the connection out of the connection's own callback.
  spa_source* lostEvent_;
  spa_source* retryTimer_;
};

}  // namespace tal
