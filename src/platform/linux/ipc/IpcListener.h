#pragma once

// The daemon's door: accepts clients, and owns the one I/O thread on which all
// sockets are read.

#include <array>
#include <asio/io_context.hpp>
#include <asio/local/stream_protocol.hpp>
#include <asio/steady_timer.hpp>
#include <asio/thread_pool.hpp>
#include <cstddef>
#include <future>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <unordered_set>

#include "platform/DurabilityGate.h"
#include "platform/linux/ipc/DurableReplies.h"
#include "platform/linux/ipc/IpcConnection.h"
#include "platform/linux/ipc/IpcSettings.h"
#include "platform/linux/ipc/ListeningSocket.h"
#include "platform/linux/ipc/RequestRunner.h"
#include "service/TalReportingService.h"

namespace tal {

/// The public operations are called by `main`, in the order of this list.
class IpcListener final : private DurabilityGate::Listener {
 public:
  /// `service`, its platform and `gate` outlive the listener. `server_name` is
  /// what hello is answered with.
  IpcListener(TalReportingService& service, DurabilityGate& gate, ListeningSocket socket,
              std::string server_name);
  IpcListener(const IpcListener&) = delete;
  IpcListener& operator=(const IpcListener&) = delete;
  /// Stops. The reporting queue must not run any more when this returns to one
  /// who then destroys what the listener borrowed.
  ~IpcListener() override;

  /// Starts the I/O thread: clients are served from here on.
  void start();

  /// Orderly end, first part: accepts nobody and reads nothing any more, and
  /// returns once everything that was received has been carried out. Sessions
  /// stay as they are.
  void drain();

  /// Orderly end, second part, after the store has been committed: sends the
  /// replies that waited for that, closes the connections and ends the thread.
  /// Waits for the reporting queue.
  void stop();

 private:
  using Acceptor = asio::local::stream_protocol::acceptor;
  using Socket = asio::local::stream_protocol::socket;

  void rowsSettled(std::uint64_t up_to) override;
  void backlogRelieved() override;

  void acceptNext();
  void accepted(const asio::error_code& error, Socket socket);
  void checkPermission(Socket socket);
  void refuse(Socket socket);
  void serve(Socket socket, const PeerCredentials& peer);
  void drainConnections();
  void connectionDrained();
  void endThread();

  TalReportingService& service_;
  const Platform& platform_;
  DurabilityGate& gate_;

  asio::io_context io_{1};
  asio::executor_work_guard<asio::io_context::executor_type> work_{io_.get_executor()};
  ListeningSocket listening_;
  Acceptor acceptor_{io_};
  asio::steady_timer accept_pause_{io_};
  // Made when somebody has to be looked up by name.
  std::optional<asio::thread_pool> look_ups_;

  DurableReplies durable_replies_;
  RunnerContext runners_;
  std::unique_ptr<std::array<char, IpcConnection::kReadSliceBytes>> read_buffer_;
  ConnectionContext connection_context_;

  // The I/O thread's own.
  IpcSettings settings_;
  std::unordered_set<std::shared_ptr<IpcConnection>> connections_;
  // Accepted, and not yet known to be permitted.
  std::size_t looked_up_ = 0;
  bool accepting_ = false;
  bool draining_ = false;
  std::size_t undrained_ = 0;
  std::promise<void> drained_;

  std::thread thread_;
};

}  // namespace tal
