#include "tools/talctl/DaemonCommands.h"

#include <chrono>
#include <optional>
#include <set>

#include "core/EventVocabulary.h"
#include "tools/talctl/ArgumentValue.h"
#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/DaemonConnection.h"
#include "tools/talctl/EventNames.h"
#include "tools/talctl/MessageBuilder.h"

namespace tal::talctl {
namespace {

using std::chrono::seconds;

// A daemon with a long backlog answers late; one that has stopped answering never does.
constexpr seconds kAnswerTimeout{60};
// It commits what its store has been handed before it ends.
constexpr seconds kKillTimeout{30};

template <typename Value>
Value require(const client::Answer<Value>& answer) {
  if (answer.value) return *answer.value;
  throw CommandFailure("the daemon did not answer: " + describe(answer.error));
}

struct Reporter {
  std::int64_t id;
  std::uint16_t service;
};

/// Several clients can have a session of the same ID: the daemon names one of them for all.
std::vector<Reporter> reportersOf(const client::Connection& client) {
  std::vector<Reporter> reporters;
  std::set<std::int64_t> seen;
  for (const std::int64_t id : require(client.allReporters(kAnswerTimeout))) {
    if (!seen.insert(id).second) continue;
    const auto found = require(client.reporter(id, kAnswerTimeout));
    if (found.id == id) reporters.push_back({id, found.serviceType});  // else it ended meanwhile
  }
  return reporters;
}

std::string serviceName(std::uint16_t service) {
  return std::string(TalReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType{service}));
}

std::string statusText(const DaemonConnection& connection, const DaemonLocation& daemon,
                       const std::vector<Reporter>& reporters, const Terminal& terminal) {
  std::string text = terminal.styled(Style::kBold, connection.server()) + " runs at " +
                     escapeControls(daemon.socket.native()) + '\n';
  if (reporters.empty()) return text + "no reporters\n";
  Table table({"REPORTER", "TYPE", "SERVICE"});
  for (const Reporter& reporter : reporters) {
    table.addRow(
        {std::to_string(reporter.id), std::to_string(reporter.service), serviceName(reporter.service)});
  }
  return text + table.text(terminal.width());
}

std::string statusJson(const DaemonConnection& connection, const DaemonLocation& daemon,
                       const std::vector<Reporter>& reporters) {
  Json list = Json::array();
  for (const Reporter& reporter : reporters) {
    list.push_back({{"reporter", reporter.id},
                    {"service_type", reporter.service},
                    {"service", serviceName(reporter.service)}});
  }
  const Json object = {{"running", true},
                       {"server", connection.server()},
                       {"socket", daemon.socket.native()},
                       {"reporters", std::move(list)}};
  return object.dump(-1, ' ', false, Json::error_handler_t::replace) + '\n';
}

}  // namespace

void runStatus(const DaemonLocation& daemon, bool json, const Terminal& terminal) {
  std::optional<DaemonConnection> connection;
  try {
    connection.emplace(daemon.socket);
  } catch (const CommandFailure&) {
    if (json) {
      const Json object = {{"running", false}, {"socket", daemon.socket.native()}};
      terminal.write(object.dump(-1, ' ', false, Json::error_handler_t::replace) + '\n');
    }
    throw;
  }
  const std::vector<Reporter> reporters = reportersOf(connection->client());
  terminal.write(json ? statusJson(*connection, daemon, reporters)
                      : statusText(*connection, daemon, reporters, terminal));
}

void runSend(const DaemonLocation& daemon, const SendOptions& options) {
  const AudioEventCategory category = parseCategory(options.category);
  const AudioEventType type = parseType(options.type);
  Json object = Json::object();
  for (const std::string& value : options.values) {
    auto [key, parsed] = parseKeyValue(value);
    object[key] = std::move(parsed);
  }
  const client::Message message = buildMessage(object);

  DaemonConnection connection(daemon.socket);
  const tal_status status = connection.client().send(message, static_cast<std::uint32_t>(category),
                                                     static_cast<std::uint16_t>(type), options.reporters);
  if (status != TAL_OK)
    throw CommandFailure(std::string("the message was not sent: ") + tal_status_text(status));
  connection.waitUntilAnswered();
}

void runKill(const DaemonLocation& daemon) {
  DaemonConnection connection(daemon.socket);
  const tal_status status = connection.client().killService();
  if (status != TAL_OK)
    throw CommandFailure(std::string("the request was not sent: ") + tal_status_text(status));
  connection.waitUntilClosed(kKillTimeout);
}

}  // namespace tal::talctl
