#include "tools/talctl/ReplayCommand.h"

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <deque>
#include <fstream>
#include <functional>
#include <iostream>
#include <map>
#include <mutex>
#include <optional>
#include <system_error>
#include <thread>
#include <utility>

#include "core/EventVocabulary.h"
#include "tools/talctl/ArgumentValue.h"
#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/DaemonConnection.h"
#include "tools/talctl/ReplayScript.h"

namespace tal::talctl {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// A daemon with a long backlog answers late; one that has stopped answering never does.
constexpr seconds kAnswerTimeout{60};
constexpr seconds kKillTimeout{30};
// How long to wait for room in a full queue before looking whether the connection still stands.
constexpr milliseconds kQueueWait{100};

std::string atLine(std::uint64_t line, const std::string& what) {
  return "line " + std::to_string(line) + ": " + what;
}

/// Which lines the daemon refused. Called on the library's thread and on the command's.
class Refusals {
 public:
  /// Sends carry their line along; of all else, answers come in the order of the requests of one kind for
  /// one reporter.
  void expect(std::uint64_t line, const ReplayStep& step) {
    if (step.operation == TAL_SEND_MESSAGE) return;
    const std::lock_guard lock(mutex_);
    waiting_[{step.operation, step.reporter}].push_back(line);
  }

  void take(const tal_reply& reply) {
    const std::lock_guard lock(mutex_);
    std::uint64_t line = reply.tag;
    if (reply.operation != TAL_SEND_MESSAGE) {
      const auto found = waiting_.find({reply.operation, reply.reporter_id});
      if (found == waiting_.end()) return;
      line = found->second.front();
      found->second.pop_front();
      if (found->second.empty()) waiting_.erase(found);
    }
    if (!reply.error) return;
    ++count_;
    if (!first_) first_ = atLine(line, "the daemon refused: " + describe(*reply.error));
  }

  void check() {
    const std::lock_guard lock(mutex_);
    if (!first_) return;
    throw CommandFailure(*first_ + (count_ > 1 ? " (and " + std::to_string(count_ - 1) + " more)" : ""));
  }

 private:
  std::mutex mutex_;
  std::map<std::pair<tal_operation, std::int64_t>, std::deque<std::uint64_t>> waiting_;
  std::uint64_t count_ = 0;
  std::optional<std::string> first_;
};

class Player {
 public:
  Player(const DaemonLocation& daemon, const Terminal& terminal)
      : terminal_(terminal),
        connection_(daemon.socket, [this](const tal_reply& reply) { refusals_.take(reply); }) {}

  void play(std::uint64_t line, const ReplayStep& step) {
    if (step.pause_before.count() > 0) std::this_thread::sleep_for(step.pause_before);
    connection_.check();
    switch (step.operation) {
      case TAL_LOOK_UP_SERVICE_TYPE:
      case TAL_LOOK_UP_REPORTER:
      case TAL_LOOK_UP_ALL_REPORTERS:
        return ask(line, step);
      case TAL_KILL_SERVICE:
        return kill();
      default:
        refusals_.expect(line, step);
        return queue(line, step);
    }
  }

  void finish() {
    if (killed_) return;
    connection_.waitUntilAnswered();
    refusals_.check();
  }

 private:
  void kill() {
    finish();
    const tal_status status = connection_.client().killService();
    if (status != TAL_OK) throw CommandFailure(tal_status_text(status));
    connection_.waitUntilClosed(kKillTimeout);
    killed_ = true;
  }

  void queue(std::uint64_t line, const ReplayStep& step) {
    tal_status status = request(line, step);
    while (status == TAL_QUEUE_FULL) {
      connection_.client().flush(kQueueWait);
      connection_.check();
      status = request(line, step);
    }
    if (status != TAL_OK) throw CommandFailure(tal_status_text(status));
  }

  tal_status request(std::uint64_t line, const ReplayStep& step) {
    tal_connection* const c = connection_.client().get();
    switch (step.operation) {
      case TAL_CREATE_SESSION:
        return tal_session_create(c, step.reporter);
      case TAL_SET_SERVICE_TYPE:
        return tal_session_set_service_type(c, step.reporter, step.service_type);
      case TAL_SET_CONFIGURATION:
        return tal_session_set_configuration(c, step.reporter, step.message ? step.message->get() : nullptr);
      case TAL_START_SESSION:
        return tal_session_start(c, step.reporter);
      case TAL_SEND_MESSAGE:
        return connection_.client().send(*step.message, step.category, step.type, step.reporters, line);
      case TAL_STOP_SESSION:
        return tal_session_stop(c, step.reporter);
      case TAL_DESTROY_SESSION:
        return tal_session_destroy(c, step.reporter);
      default:
        return TAL_INVALID;
    }
  }

  template <typename Value>
  static Value require(const client::Answer<Value>& answer) {
    if (answer.value) return *answer.value;
    throw CommandFailure("the daemon did not answer: " + describe(answer.error));
  }

  void ask(std::uint64_t line, const ReplayStep& step) {
    Json found = {{"line", line}, {"op", replayOperationName(step.operation)}};
    std::uint16_t service = 0;
    if (step.operation == TAL_LOOK_UP_ALL_REPORTERS) {
      found["reporters"] = require(connection_.client().allReporters(kAnswerTimeout));
    } else if (step.operation == TAL_LOOK_UP_REPORTER) {
      const auto reporter = require(connection_.client().reporter(step.reporter, kAnswerTimeout));
      found["reporter"] = reporter.id;
      service = reporter.serviceType;
    } else {
      service = require(connection_.client().serviceType(step.reporter, kAnswerTimeout));
      found["reporter"] = step.reporter;
    }
    if (step.operation != TAL_LOOK_UP_ALL_REPORTERS) {
      found["service_type"] = service;
      found["service"] = TalReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType{service});
    }
    terminal_.write(found.dump() + '\n');
  }

  const Terminal& terminal_;
  Refusals refusals_;  // outlives the connection, whose callbacks use it
  DaemonConnection connection_;
  bool killed_ = false;
};

/// Calls `function` for every operation of the script, and puts the number of its line before what it throws.
void forEachStep(std::istream& script,
                 const std::function<void(std::uint64_t line, const ReplayStep& step)>& function) {
  std::string text;
  for (std::uint64_t line = 1; std::getline(script, text); ++line) {
    try {
      if (const auto step = parseReplayLine(text)) function(line, *step);
    } catch (const UsageError& error) {
      throw UsageError(atLine(line, error.what()));
    } catch (const CommandFailure& failure) {
      throw CommandFailure(atLine(line, failure.what()));
    }
  }
  if (script.bad()) throw CommandFailure("cannot read the script: " + std::generic_category().message(errno));
}

}  // namespace

void runReplay(const DaemonLocation& daemon, const std::string& file, const Terminal& terminal) {
  std::ifstream script;
  if (file != "-") {
    script.open(file);
    if (!script) throw CommandFailure("cannot open " + file + ": " + std::generic_category().message(errno));
    forEachStep(script, [](std::uint64_t, const ReplayStep&) {});
    script.clear();
    if (!script.seekg(0)) {
      throw CommandFailure("cannot read " + file + " twice, to check it first: give it as standard input");
    }
  }
  Player player(daemon, terminal);
  forEachStep(file == "-" ? std::cin : script,
              [&](std::uint64_t line, const ReplayStep& step) { player.play(line, step); });
  player.finish();
}

}  // namespace tal::talctl
