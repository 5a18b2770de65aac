// Everything that the running program consists of.
#pragma once

#include <pipewire/pipewire.h>

#include <memory>
#include <string>

#include "reporters/pipewire/ClientChannel.h"
#include "reporters/pipewire/PipeWireConnector.h"
#include "reporters/pipewire/StreamReporter.h"

namespace tal {

/// Builds the program, runs it and ends it.
///
///  1. Construction takes over SIGTERM and SIGINT, and starts looking for the daemon.
///  2. run() follows PipeWire until one of the signals comes.
///  3. Then it closes all reports and gives the daemon kFarewellPatience to take them.
class ReporterProgram {
 public:
  static constexpr std::chrono::seconds kFarewellPatience{2};

  struct Options {
    /// The daemon's socket; empty: where the client library looks by itself.
    std::string daemonSocket;
  };

  /// Throws std::runtime_error when the system lacks what it needs.
  explicit ReporterProgram(const Options& options);
  ReporterProgram(const ReporterProgram&) = delete;
  ReporterProgram& operator=(const ReporterProgram&) = delete;

  void run();

 private:
  struct Library {
    Library() { pw_init(nullptr, nullptr); }
    ~Library() { pw_deinit(); }
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;
  };
  struct MainLoopDeleter {
    void operator()(pw_main_loop* loop) const { pw_main_loop_destroy(loop); }
  };
  struct ContextDeleter {
    void operator()(pw_context* context) const { pw_context_destroy(context); }
  };

  pw_loop* loop() { return pw_main_loop_get_loop(mainLoop_.get()); }

  // Each rests on those before it.
  Library library_;
  std::unique_ptr<pw_main_loop, MainLoopDeleter> mainLoop_;
  /// Carries the loss of the daemon from the client library's thread into the loop.
  spa_source* daemonLostEvent_ = nullptr;
  std::unique_ptr<pw_context, ContextDeleter> context_;
  std::unique_ptr<ClientChannel> channel_;
  std::unique_ptr<StreamReporter> reporter_;
};

}  // namespace tal
