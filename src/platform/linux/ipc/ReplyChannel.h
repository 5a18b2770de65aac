#pragma once

// The way back to one client. Whoever has replies sends them at once where the
// socket takes them; only what it does not take waits for the I/O thread.

#include <cstddef>
#include <functional>
#include <mutex>
#include <string>

namespace tal {

/// Any thread, but for what says otherwise. Borrows the socket until `close`.
class ReplyChannel {
 public:
  // More than the replies to any sensible number of requests in flight, and
  // little enough that a thousand slow readers do no harm.
  static constexpr std::size_t kMostUnsentBytes = std::size_t{256} << 10;

  struct Hooks {
    /// The socket is full: call `flush` once it can be written again. Called with
    /// the channel locked.
    std::function<void()> needs_flush;
    /// A `send` said that there is no room; now there is. Called with the channel
    /// locked.
    std::function<void()> has_room;
  };

  ReplyChannel(int socket, Hooks hooks) : socket_(socket), hooks_(std::move(hooks)) {}
  ReplyChannel(const ReplyChannel&) = delete;
  ReplyChannel& operator=(const ReplyChannel&) = delete;

  /// Sends or keeps all of `replies`, and empties it. False when so much is
  /// unsent that the client is not to be served until `has_room` is called.
  bool send(std::string& replies);

  /// The I/O thread: sends what waits. False when some of it still waits.
  bool flush();

  /// Nothing waits to be sent.
  bool isEmpty() const;

  /// The client is not waited for any more: what a full channel does not take
  /// is dropped from now on.
  void stopWaiting();

  /// The socket is not touched afterwards; replies are dropped.
  void close();

 private:
  void sendUnsent();
  void keep(std::string& replies, std::size_t already_sent);
  void tellOfRoom();
  std::size_t unsentBytes() const { return unsent_.size() - sent_; }

  mutable std::mutex mutex_;
  int socket_;
  const Hooks hooks_;
  // From `sent_` on.
  std::string unsent_;
  std::size_t sent_ = 0;
  bool sender_waits_ = false;
  bool drops_ = false;
};

}  // namespace tal
