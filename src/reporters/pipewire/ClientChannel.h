// Carries the reporter's sessions to the daemon with the client library.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <string>

#include "client/talreporting.hpp"
#include "reporters/pipewire/ReportingChannel.h"

namespace tal {

/// The channel to the real daemon. While that is away the client library keeps what is sent, and
/// sets the sessions up again once it is back. What the library cannot keep it counts.
///
/// Lives on the main loop's thread, but for the two callbacks.
class ClientChannel final : public ReportingChannel {
 public:
  struct Options {
    /// Empty: where the client library looks by itself.
    std::string socketPath;
    /// The daemon is gone. On the library's thread.
    std::function<void()> onDaemonLost;
    /// One line for people. On the library's thread.
    std::function<void(const std::string& line)> onLogLine;
  };

  explicit ClientChannel(const Options& options);

  std::int64_t openSession(const ReportedStream& stream) override;
  void sendMessage(std::int64_t reporterID, const ReportMessage& message) override;
  void closeSession(std::int64_t reporterID) override;

  /// Waits until everything sent has reached the daemon, at most this long, and ends the connection.
  /// False when something was left behind. The last call.
  bool finish(std::chrono::milliseconds patience);

 private:
  std::function<void(const std::string&)> log_;
  client::Connection connection_;
  std::map<std::int64_t, client::Session> sessions_;
};

}  // namespace tal
