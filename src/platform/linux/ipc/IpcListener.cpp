#include "platform/linux/ipc/IpcListener.h"

#include <pthread.h>
#include <sys/socket.h>

#include <asio/post.hpp>
#include <chrono>
#include <string>
#include <utility>

#include "platform/linux/ipc/AllowedPeers.h"
#include "wire/ReplyEncoder.h"

namespace tal {

namespace {

// After a failure that time alone can heal, such as too many open files.
constexpr std::chrono::seconds kAcceptPause{1};

}  // namespace

IpcListener::IpcListener(TalReportingService& service, DurabilityGate& gate, ListeningSocket socket,
                         std::string server_name)
    : service_(service),
      platform_(service.platform()),
      gate_(gate),
      listening_(std::move(socket)),
      durable_replies_(gate, platform_.reporting_queue),
      runners_{platform_.reporting_queue, durable_replies_, std::move(server_name)},
      read_buffer_(std::make_unique<std::array<char, IpcConnection::kReadSliceBytes>>()),
      connection_context_{service, runners_, *read_buffer_} {
  acceptor_.assign(asio::local::stream_protocol(), listening_.releaseSocket());
  gate_.setListener(this);
}

IpcListener::~IpcListener() { endThread(); }

void IpcListener::start() {
  thread_ = std::thread([this] {
    pthread_setname_np(pthread_self(), "tal-ipc");
    acceptNext();
    io_.run();
  });
}

void IpcListener::rowsSettled(std::uint64_t up_to) { durable_replies_.rowsSettled(up_to); }

void IpcListener::backlogRelieved() {
  asio::post(io_, [this] {
    for (const auto& connection : connections_) connection->readOn();
  });
}

void IpcListener::acceptNext() {
  if (accepting_ || draining_) return;
  settings_ = readIpcSettings(platform_.settings);
  // Those over the bound wait in the kernel until somebody leaves.
  if (connections_.size() + looked_up_ >= settings_.max_connections) return;
  accepting_ = true;
  acceptor_.async_accept([this](const asio::error_code& error, Socket socket) {
    accepting_ = false;
    accepted(error, std::move(socket));
  });
}

void IpcListener::accepted(const asio::error_code& error, Socket socket) {
  if (error == asio::error::operation_aborted || draining_) return;
  if (!error) {
    checkPermission(std::move(socket));
  } else if (error != asio::error::connection_aborted) {
    TAL_LOG_ERROR(platform_.log.service, "no connection accepted for a second: ", error.message());
    accept_pause_.expires_after(kAcceptPause);
    accept_pause_.async_wait([this](const asio::error_code& cancelled) {
      if (!cancelled) acceptNext();
    });
    return;
  }
  acceptNext();
}

void IpcListener::checkPermission(Socket socket) {
  PeerCredentials peer = peerCredentials(socket.native_handle());
  AllowedPeers allowed = readAllowedPeers(platform_.settings);
  if (allowed.includesEverybody()) return serve(std::move(socket), peer);

  ++looked_up_;
  if (!look_ups_) look_ups_.emplace(1);
  const auto shared_socket = std::make_shared<Socket>(std::move(socket));
  asio::post(*look_ups_, [this, shared_socket, peer = std::move(peer), allowed = std::move(allowed)] {
    const bool permitted = allowed.includes(peer);
    asio::post(io_, [this, shared_socket, peer, permitted] {
      --looked_up_;
      if (draining_) return;
      if (permitted) {
        serve(std::move(*shared_socket), peer);
      } else {
        TAL_LOG(platform_.log.service, "refused process ", peer.process_identifier, " of user ", peer.user);
        refuse(std::move(*shared_socket));
      }
      acceptNext();
    });
  });
}

// A socket that was just accepted takes the few bytes of the reply in any case.
void IpcListener::refuse(Socket socket) {
  std::string reply;
  ReplyEncoder(reply).error(0, WireErrorCode::kNotPermitted, "this user may not connect");
  static_cast<void>(::send(socket.native_handle(), reply.data(), reply.size(), MSG_DONTWAIT | MSG_NOSIGNAL));
}

void IpcListener::serve(Socket socket, const PeerCredentials& peer) {
  IpcConnection::Hooks hooks{.closed =
                                 [this](const std::shared_ptr<IpcConnection>& connection) {
                                   connections_.erase(connection);
                                   acceptNext();
                                 },
                             .drained = [this] { connectionDrained(); }};
  const auto connection = std::make_shared<IpcConnection>(std::move(socket), peer, settings_.max_frame_bytes,
                                                          connection_context_, std::move(hooks));
  connections_.insert(connection);
  connection->start();
}

void IpcListener::drain() {
  std::future<void> done = drained_.get_future();
  asio::post(io_, [this] { drainConnections(); });
  done.wait();
}

void IpcListener::drainConnections() {
  draining_ = true;
  asio::error_code ignored;
  acceptor_.close(ignored);
  accept_pause_.cancel();
  listening_.removeFile();
  // One more than there are connections, so that the last one is counted here.
  undrained_ = connections_.size() + 1;
  for (const auto& connection : connections_) connection->drain();
  connectionDrained();
}

void IpcListener::connectionDrained() {
  if (--undrained_ == 0) drained_.set_value();
}

void IpcListener::stop() {
  // What the store's last words set off stands in the queue in front of this.
  std::promise<void> replies_sent;
  platform_.reporting_queue.post([&replies_sent] { replies_sent.set_value(); });
  replies_sent.get_future().wait();
  endThread();
}

void IpcListener::endThread() {
  gate_.setListener(nullptr);
  if (!thread_.joinable()) return;
  asio::post(io_, [this] {
    for (const auto& connection : connections_) connection->abandon();
    connections_.clear();
    io_.stop();
  });
  thread_.join();
  if (look_ups_) look_ups_->join();
}

}  // namespace tal
