#include "platform/linux/ipc/IpcConnection.h"

#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <asio/post.hpp>
#include <cerrno>
#include <string>
#include <utility>

namespace tal {

namespace {

std::string describe(const PeerCredentials& peer) {
  return "unix socket of process " + std::to_string(peer.process_identifier) + ", user " +
         std::to_string(peer.user);
}

// Null where the kernel did not tell.
std::shared_ptr<const ClientIdentity> identityOf(const PeerCredentials& peer) {
  if (peer.user == PeerCredentials{}.user) return nullptr;
  return std::make_shared<const ClientIdentity>(ClientIdentity{
      .user = peer.user,
      .group = peer.group,
      .supplementary_groups = {peer.supplementary_groups.begin(), peer.supplementary_groups.end()}});
}

// True when the peer has closed both directions: nobody reads replies any more.
bool hungUp(int socket) {
  pollfd state{.fd = socket, .events = 0, .revents = 0};
  return ::poll(&state, 1, 0) == 1 && (state.revents & (POLLHUP | POLLERR)) != 0;
}

// The result of one read without waiting: the bytes, 0 at the end of the input
// or when the connection is broken, nothing when there is nothing to read now.
std::optional<std::size_t> receive(int socket, std::span<char> buffer) {
  for (;;) {
    const ssize_t count = ::recv(socket, buffer.data(), buffer.size(), MSG_DONTWAIT);
    if (count >= 0) return static_cast<std::size_t>(count);
    if (errno == EAGAIN || errno == EWOULDBLOCK) return std::nullopt;
    if (errno != EINTR) return 0;
  }
}

// The bytes that wait in the kernel to be read.
std::size_t readableBytes(int socket) {
  int count = 0;
  return ::ioctl(socket, FIONREAD, &count) == 0 && count > 0 ? static_cast<std::size_t>(count) : 0;
}

}  // namespace

IpcConnection::IpcConnection(Socket socket, PeerCredentials peer, std::uint32_t max_frame_bytes,
                             ConnectionContext& context, Hooks hooks)
    : socket_(std::move(socket)),
      peer_(std::move(peer)),
      context_(context),
      hooks_(std::move(hooks)),
      splitter_(max_frame_bytes) {}

void IpcConnection::start() {
  client_ = context_.service.shouldAcceptNewConnection(peer_.process_identifier, describe(peer_),
                                                       identityOf(peer_));
  makeRunner();
  waitReadable();
}

// The hooks come from other threads, so each goes through the I/O thread's
// context; a connection that has gone meanwhile needs nothing.
void IpcConnection::makeRunner() {
  const auto posted = [this](void (*action)(IpcConnection&)) {
    return [weak = weak_from_this(), executor = socket_.get_executor(), action] {
      asio::post(executor, [weak, action] {
        const auto self = weak.lock();
        if (self && !self->closed_) action(*self);
      });
    };
  };
  channel_ = std::make_shared<ReplyChannel>(
      socket_.native_handle(),
      ReplyChannel::Hooks{.needs_flush = posted([](IpcConnection& self) { self.waitWritable(); }),
                          .has_room = posted([](IpcConnection& self) { self.runner_->resume(); })});
  runner_ = std::make_shared<RequestRunner>(
      client_, context_.runners, channel_,
      RequestRunner::Hooks{.has_room = posted([](IpcConnection& self) {
                             self.has_room_ = true;
                             self.readOn();
                           }),
                           .carried_out = posted([](IpcConnection& self) { self.carriedOut(); }),
                           .settled = posted([](IpcConnection& self) {
                             self.settled_ = true;
                             self.closeWhenAnswered();
                           })});
}

void IpcConnection::waitReadable() {
  if (waits_readable_ || input_ended_) return;
  waits_readable_ = true;
  socket_.async_wait(Socket::wait_read, [self = shared_from_this()](const asio::error_code& error) {
    self->waits_readable_ = false;
    if (!error && !self->closed_ && !self->input_ended_) self->readSlice();
  });
}

void IpcConnection::readOn() {
  if (has_room_ && !context_.runners.durable_replies.gate().backlogIsOverBound()) waitReadable();
}

void IpcConnection::readSlice() {
  // The store may have fallen behind since the wait began.
  if (context_.runners.durable_replies.gate().backlogIsOverBound()) return;
  const std::optional<std::size_t> count = receive(socket_.native_handle(), context_.read_buffer);
  if (!count) return waitReadable();
  if (*count == 0) {
    broke_off_ = splitter_.isMidFrame();
    peer_gone_ = hungUp(socket_.native_handle());
    return endInput();
  }
  has_room_ = takeIn({context_.read_buffer.data(), *count});
  if (input_ended_) return;
  readOn();
}

bool IpcConnection::takeIn(std::string_view bytes) {
  auto batch = runner_->takeBatch();
  splitter_.feed(bytes);
  for (;;) {
    const FrameSplitter::Result result = splitter_.next();
    if (result.status == FrameSplitter::Status::kFrame) {
      takeFrame(result.content, *batch);
      continue;
    }
    const bool bad_length = result.status == FrameSplitter::Status::kBadLength;
    if (bad_length) {
      batch->add().error = RequestError{.code = WireErrorCode::kBadFrameLength,
                                        .message = "a frame of length 0 or over the limit"};
    }
    const bool has_room = batch->size() == 0 || runner_->submit(std::move(batch));
    if (bad_length) endInput();
    return has_room;
  }
}

void IpcConnection::takeFrame(std::string_view frame, RequestBatch& batch) {
  RequestBatch::Entry& entry = batch.add();
  batch.addBytes(kFrameHeaderBytes + frame.size());
  entry.error = decoder_.decode(frame, entry.request);
  if (entry.error) return;
  Request& request = entry.request;
  if (request.operation == Operation::kSendMessage) {
    client_->prepareMessage(request.message, request.reporter_ids);
  } else if (request.operation == Operation::kKillService) {
    if (peer_.user == 0 || peer_.user == ::geteuid()) {
      context_.runners.killed.store(true, std::memory_order_relaxed);
      client_->killService();
    } else {
      entry.error = RequestError{.code = WireErrorCode::kNotPermitted,
                                 .call = request.call,
                                 .wants_reply = request.call != 0,
                                 .message = "only root and the daemon's own user may end the service"};
    }
  }
}

void IpcConnection::endInput() {
  if (std::exchange(input_ended_, true)) return;
  if (peer_gone_) channel_->close();
  runner_->endInput();
}

void IpcConnection::waitWritable() {
  if (waits_writable_) return;
  waits_writable_ = true;
  socket_.async_wait(Socket::wait_write, [self = shared_from_this()](const asio::error_code& error) {
    self->waits_writable_ = false;
    if (error || self->closed_) return;
    if (self->channel_->flush()) {
      self->closeWhenAnswered();
    } else {
      self->waitWritable();
    }
  });
}

void IpcConnection::carriedOut() {
  carried_out_ = true;
  if (draining_) return hooks_.drained();
  if (broke_off_) context_.service.interruptionHandler(client_);
  context_.service.invalidationHandler(client_, peer_.process_identifier);
  client_.reset();
  closeWhenAnswered();
}

void IpcConnection::closeWhenAnswered() {
  if (!carried_out_ || draining_ || closed_) return;
  if (peer_gone_ || (settled_ && channel_->isEmpty())) close();
}

void IpcConnection::close() {
  const auto self = shared_from_this();
  abandon();
  hooks_.closed(self);
}

void IpcConnection::abandon() {
  if (std::exchange(closed_, true)) return;
  channel_->close();
  asio::error_code ignored;
  socket_.close(ignored);
}

void IpcConnection::drain() {
  draining_ = true;
  if (carried_out_) return hooks_.drained();
  channel_->stopWaiting();
  if (!input_ended_) {
    // What arrives from now on was not received in time.
    std::size_t left = readableBytes(socket_.native_handle());
    while (left != 0 && !input_ended_) {
      const auto slice = context_.read_buffer.first(std::min(left, context_.read_buffer.size()));
      const std::optional<std::size_t> count = receive(socket_.native_handle(), slice);
      if (!count || *count == 0) break;
      takeIn({slice.data(), *count});
      left -= *count;
    }
  }
  endInput();
}

}  // namespace tal
