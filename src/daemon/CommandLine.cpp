#include "daemon/CommandLine.h"

#include <CLI/CLI.hpp>
#include <map>

namespace tal {

std::variant<DaemonOptions, ExitStatus> parseCommandLine(int argument_count, const char* const* arguments,
                                                         const std::string& version) {
  DaemonOptions options;
  CLI::App app("Takes in the telemetry of audio programs and stores what can be told of it.",
               "talreportingd");
  app.set_version_flag("--version", "talreportingd " + version);

  DirectoryOptions& directories = options.directories;
  app.add_option("--root", directories.root, "Keep everything in config, state, run and log below DIR")
      ->type_name("DIR");
  app.add_option("--config-dir", directories.config, "Settings of the administrator")->type_name("DIR");
  app.add_option("--state-dir", directories.state, "The store, and settings of the daemon's own")
      ->type_name("DIR");
  app.add_option("--runtime-dir", directories.runtime, "The socket and notifications")->type_name("DIR");
  app.add_option("--log-dir", directories.log, "Diagnostic logs")->type_name("DIR");

  app.add_option("--host-root", options.host_root,
                 "Read /proc and /sys of the device below DIR: a recorded device, or a mounted host")
      ->type_name("DIR");

  const std::map<std::string, LogLevel> levels = {{"default", LogLevel::kDefault},
                                                  {"info", LogLevel::kInfo},
                                                  {"debug", LogLevel::kDebug},
                                                  {"error", LogLevel::kError}};
  app.add_option("--log-level", options.log_level, "The most detailed lines: error, default, info or debug")
      ->type_name("LEVEL")
      ->transform(CLI::CheckedTransformer(levels, CLI::ignore_case).description(""));
  const std::map<std::string, DaemonOptions::LogTo> sinks = {{"stderr", DaemonOptions::LogTo::kStderr},
                                                             {"journal", DaemonOptions::LogTo::kJournal}};
  app.add_option("--log-to", options.log_to, "Where log lines go: stderr or journal")
      ->type_name("SINK")
      ->transform(CLI::CheckedTransformer(sinks, CLI::ignore_case).description(""));

  try {
    app.parse(argument_count, arguments);
  } catch (const CLI::ParseError& error) {
    return ExitStatus{app.exit(error) == 0 ? 0 : kExitWrongUsage};
  }
  return options;
}

}  // namespace tal
