#include "reporters/pipewire/ClientChannel.h"

#include <utility>
#include <variant>

namespace tal {

namespace {

client::Options connectionOptions(const ClientChannel::Options& options) {
  client::Options result;
  result.socketPath = options.socketPath;
  result.onConnected = [log = options.onLogLine](std::string_view server) {
    log("reports to " + std::string(server));
  };
  result.onDisconnected = [log = options.onLogLine, lost = options.onDaemonLost](const tal_error& why) {
    log(std::string("the daemon is gone, waiting for it: ") + why.message);
    lost();
  };
  result.onError = [log = options.onLogLine](const tal_error& error) { log(error.message); };
  return result;
}

}  // namespace

ClientChannel::ClientChannel(const Options& options)
    : log_(options.onLogLine), connection_(connectionOptions(options)) {}

std::int64_t ClientChannel::openSession(const ReportedStream& stream) {
  client::Message configuration;
  if (!stream.applicationName.empty()) configuration.add("HostApplicationDisplayID", stream.applicationName);
  client::Session session(connection_, static_cast<std::uint16_t>(stream.serviceType), &configuration);
  const std::int64_t reporterID = session.reporter();
  if (session.status() != TAL_OK) {
    log_("a stream of " + stream.applicationName + " is not reported: " + tal_status_text(session.status()));
  }
  sessions_.emplace(reporterID, std::move(session));
  return reporterID;
}

void ClientChannel::sendMessage(std::int64_t reporterID, const ReportMessage& message) {
  const auto session = sessions_.find(reporterID);
  // A session that could not be opened was logged; its messages would only be counted as lost, one by one.
  if (session == sessions_.end() || session->second.status() != TAL_OK) return;
  client::Message encoded;
  for (const auto& [key, value] : message.fields) {
    std::visit([&, &name = key](const auto& alternative) { encoded.add(name, alternative); }, value);
  }
  // A message that is turned away is counted, and reported once there is room again, by the library.
  session->second.send(encoded, static_cast<std::uint32_t>(message.category),
                       static_cast<std::uint16_t>(message.type));
}

void ClientChannel::closeSession(std::int64_t reporterID) { sessions_.erase(reporterID); }

bool ClientChannel::finish(std::chrono::milliseconds patience) {
  sessions_.clear();
  return connection_.close(patience) == TAL_OK;
}

}  // namespace tal
