#include "platform/linux/ipc/ReplyChannel.h"

#include <sys/socket.h>

#include <cerrno>
#include <optional>
#include <string_view>

namespace tal {

namespace {

constexpr int kNoSocket = -1;
// A buffer that was needed once is not kept for ever.
constexpr std::size_t kMostKeptAllocated = 4096;

// The number of bytes that the socket took, nothing when the peer has gone.
std::optional<std::size_t> sendSome(int socket, std::string_view bytes) {
  std::size_t sent = 0;
  while (sent < bytes.size()) {
    const ssize_t count =
        ::send(socket, bytes.data() + sent, bytes.size() - sent, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count >= 0) {
      sent += static_cast<std::size_t>(count);
    } else if (errno == EAGAIN || errno == EWOULDBLOCK) {
      break;
    } else if (errno != EINTR) {
      return std::nullopt;
    }
  }
  return sent;
}

}  // namespace

bool ReplyChannel::send(std::string& replies) {
  const std::lock_guard lock(mutex_);
  if (socket_ == kNoSocket || replies.empty()) {
    replies.clear();
    return true;
  }
  std::size_t sent = 0;
  if (unsent_.empty()) {
    const std::optional<std::size_t> count = sendSome(socket_, replies);
    if (!count) {
      socket_ = kNoSocket;
      replies.clear();
      return true;
    }
    sent = *count;
    if (sent < replies.size()) hooks_.needs_flush();
  }
  keep(replies, sent);
  sender_waits_ = !drops_ && unsentBytes() >= kMostUnsentBytes;
  return !sender_waits_;
}

void ReplyChannel::keep(std::string& replies, std::size_t already_sent) {
  if (already_sent < replies.size() && !(drops_ && unsentBytes() >= kMostUnsentBytes)) {
    unsent_.append(replies, already_sent);
  }
  replies.clear();
}

bool ReplyChannel::flush() {
  const std::lock_guard lock(mutex_);
  sendUnsent();
  // Not at the first byte of room: the sender would be woken for each.
  if (unsentBytes() <= kMostUnsentBytes / 2) tellOfRoom();
  return unsent_.empty();
}

void ReplyChannel::sendUnsent() {
  if (socket_ != kNoSocket) {
    const auto sent = sendSome(socket_, std::string_view(unsent_).substr(sent_));
    if (sent) {
      sent_ += *sent;
    } else {
      socket_ = kNoSocket;
    }
  }
  if (socket_ == kNoSocket || sent_ == unsent_.size()) {
    unsent_.clear();
    sent_ = 0;
    if (unsent_.capacity() > kMostKeptAllocated) unsent_.shrink_to_fit();
  } else if (sent_ >= kMostUnsentBytes) {
    unsent_.erase(0, sent_);
    sent_ = 0;
  }
}

void ReplyChannel::tellOfRoom() {
  if (!sender_waits_) return;
  sender_waits_ = false;
  hooks_.has_room();
}

bool ReplyChannel::isEmpty() const {
  const std::lock_guard lock(mutex_);
  return unsent_.empty();
}

void ReplyChannel::stopWaiting() {
  const std::lock_guard lock(mutex_);
  drops_ = true;
  tellOfRoom();
}

void ReplyChannel::close() {
  const std::lock_guard lock(mutex_);
  socket_ = kNoSocket;
  unsent_.clear();
  sent_ = 0;
  tellOfRoom();
}

}  // namespace tal
