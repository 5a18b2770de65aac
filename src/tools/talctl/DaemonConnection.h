#pragma once

// A connection of a command: there at once or a failure, unlike the library's
// own, which waits for a daemon for as long as it takes.

#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <functional>
#include <mutex>
#include <optional>
#include <string>

#include "client/talreporting.hpp"

namespace tal::talctl {

/// Owns the connection; used on the thread that made it.
class DaemonConnection {
 public:
  using ReplyFunction = std::function<void(const tal_reply&)>;

  /// Connects, with durable acknowledgement: what is answered is stored. Every
  /// answer to a request is handed to `on_reply`, on the library's thread; without
  /// that, the first refusal is kept for the functions below. Throws
  /// CommandFailure where no daemon answers or it does not admit this user.
  explicit DaemonConnection(const std::filesystem::path& socket, ReplyFunction on_reply = nullptr);
  ~DaemonConnection();
  DaemonConnection(const DaemonConnection&) = delete;
  DaemonConnection& operator=(const DaemonConnection&) = delete;

  /// The daemon's name and version.
  const std::string& server() const { return server_; }
  const client::Connection& client() const { return *client_; }

  /// Waits until everything is answered, however long the daemon takes. Throws
  /// CommandFailure when the connection breaks or something was refused.
  void waitUntilAnswered();

  /// The same, but a broken connection is what is hoped for, within the time.
  void waitUntilClosed(std::chrono::milliseconds at_most);

  /// Throws CommandFailure when the connection has broken.
  void check();

 private:
  client::Options options(const std::filesystem::path& socket, ReplyFunction on_reply);

  std::mutex mutex_;
  std::condition_variable changed_;
  // Under mutex_, down to server_, which is written before the constructor ends.
  bool connected_ = false;
  std::optional<std::string> failure_;  // why there is no connection (any longer)
  std::optional<std::string> refusal_;  // the first request that was refused
  std::string server_;
  std::optional<client::Connection> client_;
};

/// What went wrong, in one line.
std::string describe(const tal_error& error);

}  // namespace tal::talctl
