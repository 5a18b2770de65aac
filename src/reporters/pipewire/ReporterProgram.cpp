#include "reporters/pipewire/ReporterProgram.h"

#include <pipewire/extensions/profiler.h>
#include <pipewire/impl-module.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <stdexcept>

#include "reporters/pipewire/RemoteSocket.h"

namespace tal {

namespace {

/// One call for one line: the client library's thread writes too.
void logLine(const std::string& line) { std::fprintf(stderr, "tal-pipewire-reporter: %s\n", line.c_str()); }

}  // namespace

ReporterProgram::ReporterProgram(const Options& options) : mainLoop_(pw_main_loop_new(nullptr)) {
  if (!mainLoop_) throw std::runtime_error("cannot make an event loop");
  // Before another thread is started, so that the signals are blocked in all of them.
  for (const int signal : {SIGTERM, SIGINT}) {
    const auto* source = pw_loop_add_signal(
        loop(), signal, [](void* mainLoop, int) { pw_main_loop_quit(static_cast<pw_main_loop*>(mainLoop)); },
        mainLoop_.get());
    if (!source) throw std::runtime_error("cannot receive signals");
  }
  daemonLostEvent_ = pw_loop_add_event(
      loop(),
      [](void* self, std::uint64_t) { static_cast<ReporterProgram*>(self)->reporter_->repeatStarts(); },
      this);
  if (!daemonLostEvent_) throw std::runtime_error("cannot make an event source");
  context_.reset(pw_context_new(loop(), nullptr, 0));
  if (!context_) throw std::runtime_error("cannot make a PipeWire context");
  // Speaks the profiler's protocol. Without it streams are reported all the same, but for their xruns.
  if (!pw_context_load_module(context_.get(), PW_EXTENSION_MODULE_PROFILER, nullptr, nullptr)) {
    logLine("xruns are not reported: PipeWire's profiler module cannot be loaded");
  }
  channel_ = std::make_unique<ClientChannel>(ClientChannel::Options{
      .socketPath = options.daemonSocket,
      .onDaemonLost = [this] { pw_loop_signal_event(loop(), daemonLostEvent_); },
      .onLogLine = logLine,
  });
  reporter_ = std::make_unique<StreamReporter>(*channel_);
}

void ReporterProgram::run() {
  {
    const auto environment = [](const char* name) -> const char* { return std::getenv(name); };
    PipeWireConnector connector({
        .loop = loop(),
        .context = context_.get(),
        .reporter = *reporter_,
        .socketPaths = remoteSocketPaths(remoteNameFrom(environment), environment),
        .onLogLine = logLine,
    });
    connector.start();
    pw_main_loop_run(mainLoop_.get());
  }
  if (!channel_->finish(kFarewellPatience)) logLine("the daemon is away: the last reports are lost");
}

}  // namespace tal
