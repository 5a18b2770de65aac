// tal-pipewire-reporter: reports every audio stream of a PipeWire to the telemetry daemon.
#include <CLI/CLI.hpp>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>

#include "reporters/pipewire/ReporterProgram.h"

namespace {

/// The exit status.
int runWith(int argc, char** argv) {
  CLI::App app("Reports every audio stream of a PipeWire to talreportingd, until SIGTERM or SIGINT.",
               "tal-pipewire-reporter");
  std::string root;
  std::string socket;
  std::string remote;
  auto* rootOption = app.add_option("--root", root, "the directory that the daemon was given as --root");
  app.add_option("--socket", socket, "the daemon's socket")->excludes(rootOption);
  app.add_option("--remote", remote, "the PipeWire to follow: a socket's name or path")->type_name("NAME");
  app.set_version_flag("--version", "tal-pipewire-reporter " TAL_VERSION);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    return app.exit(error) == 0 ? 0 : 2;
  }
  if (!root.empty()) socket = root + "/run/talreporting.sock";
  // PipeWire's library asks the environment before anything that it is told.
  if (!remote.empty()) setenv("PIPEWIRE_REMOTE", remote.c_str(), 1);
  tal::ReporterProgram({.daemonSocket = socket}).run();
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  try {
    return runWith(argc, argv);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "tal-pipewire-reporter: %s\n", error.what());
    return 1;
  }
}
