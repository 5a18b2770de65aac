// talctl: the command-line tool beside the daemon. This file knows the command
// line and the exit statuses; each command is a function elsewhere.

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <functional>
#include <iostream>
#include <optional>
#include <string>
#include <vector>

#include "tools/talctl/CapturesCommand.h"
#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/DaemonCommands.h"
#include "tools/talctl/DaemonLocation.h"
#include "tools/talctl/EventsCommand.h"
#include "tools/talctl/NotifyCommand.h"
#include "tools/talctl/PerfCommand.h"
#include "tools/talctl/ReplayCommand.h"
#include "tools/talctl/ReportCommand.h"
#include "tools/talctl/SettingsCommand.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {
namespace {

constexpr int kDone = 0;
constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

/// What the command line said. The parser writes into it, and picks `run`.
struct CommandLine {
  LocationOptions location;
  bool json = false;
  SendOptions send;
  EventsOptions events;
  ReportOptions report;
  std::string script;
  std::string capture;
  std::string file;
  std::vector<std::string> files;
  std::string notification;
  std::string state;
  std::string domain;
  std::string key;
  std::string value;
  std::function<void(const DaemonLocation&, const Terminal&)> run;
};

void addJson(CLI::App& command, CommandLine& line) {
  command.add_flag("--json", line.json, "One JSON object a line, for programs");
}

void addStatus(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("status", "Is it running, its version, its clients' reporters");
  addJson(*command, line);
  command->callback([&line] {
    line.run = [&line](const auto& daemon, const auto& terminal) { runStatus(daemon, line.json, terminal); };
  });
}

void addSend(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("send", "Send one message");
  command->add_option("CATEGORY", line.send.category, "Such as Playback or 4")->required();
  command->add_option("TYPE", line.send.type, "Such as Start or 1")->required();
  command->add_option("values", line.send.values, "key=value: 1, 1.5, true, \"text\", {json}, word");
  command->add_option("--reporter", line.send.reporters, "Only to this reporter; may be repeated")
      ->allow_extra_args(false);
  command->callback(
      [&line] { line.run = [&line](const auto& daemon, const auto&) { runSend(daemon, line.send); }; });
}

void addReplay(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("replay", "Carry out a recorded script");
  command->add_option("FILE", line.script, "One operation a line, in JSON; - for standard input")->required();
  command->callback([&line] {
    line.run = [&line](const auto& daemon, const auto& terminal) {
      runReplay(daemon, line.script, terminal);
    };
  });
}

void addEvents(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("events", "Print stored events, the newest last");
  command->add_flag("-f,--follow", line.events.follow, "Go on with new ones as they come");
  command->add_option("--name", line.events.name_glob, "Only names that match, such as '*.Playback.*'");
  command->add_option("--since", line.events.since, "Only so far back, such as 90s, 10m, 2h, 7d");
  command->add_option("-n", line.events.count, "Only the newest so many (without --since: 20)")
      ->check(CLI::NonNegativeNumber);
  addJson(*command, line);
  command->callback([&line] {
    line.run = [&line](const auto& daemon, const auto& terminal) {
      line.events.json = line.json;
      runEvents(daemon, line.events, terminal);
    };
  });
}

void addReport(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("report", "Who played and recorded what, how long, how loud");
  command->add_option("--since", line.report.since, "Only so far back, such as 90s, 10m, 2h, 7d");
  command->add_option("--html", line.report.html,
                      "Write a page for a browser to this file; - for standard output");
  command->callback([&line] {
    line.run = [&line](const auto& daemon, const auto& terminal) {
      runReport(daemon, line.report, terminal);
    };
  });
}

void addNotify(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("notify", "Tell programs that something has changed");
  command->require_subcommand(1);
  CLI::App* post = command->add_subcommand("post", "Post a notification");
  post->add_option("NAME", line.notification, "Such as org.vantle.talsys.reporting")->required();
  CLI::Option* state = post->add_option("STATE", line.state, "Without it, the state stays (0 at first)");
  post->callback([&line, state] {
    line.run = [&line, state](const auto& daemon, const auto&) {
      runNotifyPost(daemon, line.notification, state->count() > 0 ? std::optional(line.state) : std::nullopt);
    };
  });
}

void addCaptures(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("captures", "List what was captured when a fault was seen");
  addJson(*command, line);
  CLI::App* show = command->add_subcommand("show", "Print one");
  show->add_option("ID", line.capture, "Its name in the list")->required();
  show->add_option("--file", line.file, "Only this file of it, as it is");
  command->callback([&line, show] {
    line.run = [&line, shows = show->parsed()](const auto& daemon, const auto& terminal) {
      if (shows) return runCapturesShow(daemon, line.capture, line.file, terminal);
      runCaptures(daemon, line.json, terminal);
    };
  });
}

void addSettings(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("settings", "Read and write settings");
  command->require_subcommand(1);
  CLI::App* get = command->add_subcommand("get", "Print one setting or a whole domain");
  get->add_option("DOMAIN", line.domain, "Such as org.vantle.talsys")->required();
  get->add_option("KEY", line.key, "Without it: all keys");
  addJson(*get, line);
  get->callback([&line] {
    line.run = [&line](const auto& daemon, const auto& terminal) {
      runSettingsGet(daemon, line.domain, line.key, line.json, terminal);
    };
  });
  CLI::App* set = command->add_subcommand("set", "Set one in the state layer");
  set->add_option("DOMAIN", line.domain, "Such as org.vantle.talsys")->required();
  set->add_option("KEY", line.key)->required();
  set->add_option("VALUE", line.value, "1, 1.5, true, \"text\", [json], word")->required();
  set->callback([&line] {
    line.run = [&line](const auto& daemon, const auto&) {
      runSettingsSet(daemon, line.domain, line.key, line.value);
    };
  });
}

void addPerf(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("perf", "Read what performance traces measured");
  command->require_subcommand(1);
  CLI::App* show = command->add_subcommand("show", "Print one results file, or two side by side");
  show->add_option("FILE", line.files, "One or two .pdj files")->required();
  show->callback([&line] {
    line.run = [&line](const auto&, const auto& terminal) { runPerfShow(line.files, terminal); };
  });
}

void addKill(CLI::App& app, CommandLine& line) {
  CLI::App* command = app.add_subcommand("kill", "End the daemon at once, after its store is committed");
  command->callback([&line] { line.run = [](const auto& daemon, const auto&) { runKill(daemon); }; });
}

int complain(int status, const char* what) {
  std::fprintf(stderr, "talctl: %s\n", escapeControls(what).c_str());
  return status;
}

int run(int argc, char** argv) {
  CLI::App app("Talks to talreportingd and reads what it has stored.", "talctl");
  CommandLine line;
  app.set_version_flag("--version", "talctl " TAL_VERSION);
  app.require_subcommand(1);
  CLI::Option* root =
      app.add_option("--root", line.location.root, "Directory of a daemon started with --root");
  app.add_option("--socket", line.location.socket, "The daemon's socket")->excludes(root);
  addStatus(app, line);
  addSend(app, line);
  addReplay(app, line);
  addEvents(app, line);
  addReport(app, line);
  addNotify(app, line);
  addCaptures(app, line);
  addSettings(app, line);
  addPerf(app, line);
  addKill(app, line);

  try {
    app.parse(argc, argv);
  } catch (const CLI::Success& asked) {  // --help, --version
    return app.exit(asked);
  } catch (const CLI::ParseError& error) {
    return complain(kWrongUsage, error.what());
  }
  try {
    line.run(locateDaemon(line.location), Terminal::standardOutput());
    return kDone;
  } catch (const UsageError& error) {
    return complain(kWrongUsage, error.what());
  } catch (const std::exception& error) {
    return complain(kFailed, error.what());
  }
}

}  // namespace
}  // namespace tal::talctl

int main(int argc, char** argv) {
  try {
    return tal::talctl::run(argc, argv);
  } catch (...) {  // not even the report of a failure was possible
    return tal::talctl::kFailed;
  }
}
