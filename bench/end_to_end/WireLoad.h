#pragma once

// A client that costs next to nothing itself: its requests are encoded before
// the clock runs, and it makes one system call for many of them.

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageDict.h"
#include "wire/WireProtocol.h"

namespace tal::bench {

/// The message of a stream that begins to play, the `number`th of its kind.
MessageDict playbackStart(int number);

/// Frames, one behind the other.
class Requests {
 public:
  std::size_t size() const { return ends_.size(); }
  /// The bytes of the frames from `first` on, up to before `last`.
  std::string_view between(std::size_t first, std::size_t last) const;

  void sendMessage(int number, std::int64_t reporter_id);
  void hello(bool durable);
  /// An operation on one session; call 0 for no reply.
  void session(Operation operation, std::uint64_t call, std::int64_t reporter_id);
  void setServiceType(std::int64_t reporter_id);

 private:
  std::string bytes_;
  std::vector<std::size_t> ends_;
};

/// Ends the program by an exception when something fails, an error reply too.
class Connection {
 public:
  explicit Connection(const std::filesystem::path& socket_path);
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection();

  void send(std::string_view bytes) const;
  /// Waits for replies and returns how many came.
  std::size_t receive();

  /// Sends all requests, each of which is answered once, with at most this many
  /// in flight, and waits for all replies.
  void exchange(const Requests& requests, std::size_t in_flight);

 private:
  std::size_t countReplies(std::string_view bytes);

  int socket_;
  // Of a reply that has come in part.
  std::string rest_;
};

}  // namespace tal::bench
