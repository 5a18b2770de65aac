// tal-perftrail: drives the tracer for the daemon, one recording long, so that the
// daemon itself neither links the tracer nor changes its environment. See
// TraceHelper.h for how it is spoken to.

#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <string>

#include "platform/linux/tracing/TraceHelper.h"
#include "platform/linux/tracing/helper/Recording.h"
#include "platform/linux/tracing/helper/SessionDaemon.h"

namespace tal {
namespace {

constexpr int kDone = 0;
constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;
constexpr char kProfilingTemplate[] = "3";

void say(const char* word, const std::string& text = "") {
  std::printf("%s%s%s\n", word, text.empty() ? "" : " ", text.c_str());
  std::fflush(stdout);
}

int fail(const char* word, const std::string& error) {
  say(word, error);
  return kFailed;
}

/// False when the daemon has given the recording up.
bool waitForStop() {
  std::string line;
  while (std::getline(std::cin, line)) {
    if (line == kHelperStop) return true;
  }
  return false;
}

int record(const std::string& trace_template, const std::string& directory, const std::string& home) {
  SessionDaemon session_daemon;
  std::string error = session_daemon.ensure(home);
  if (!error.empty()) return fail(kHelperStartFailed, error);
  Recording recording("talreporting-" + std::to_string(::getpid()), directory);
  error = recording.start(trace_template == kProfilingTemplate ? Recording::Events::kAll
                                                               : Recording::Events::kSignposts);
  if (!error.empty()) return fail(kHelperStartFailed, error);
  say(kHelperStarted);
  if (!waitForStop()) return kDone;

  error = recording.stop();
  if (!error.empty()) return fail(kHelperFailed, error);
  say(kHelperStopped);
  error = recording.destroy();
  if (!error.empty()) return fail(kHelperFailed, error);
  say(kHelperComplete, directory);
  return kDone;
}

}  // namespace
}  // namespace tal

int main(int argument_count, char** arguments) {
  constexpr int kArguments = 4;
  if (argument_count != kArguments) {
    std::fprintf(stderr, "tal-perftrail is started by talreportingd: TEMPLATE TRACE-DIRECTORY HOME\n");
    return tal::kWrongUsage;
  }
  return tal::record(arguments[1], arguments[2], arguments[3]);
}
