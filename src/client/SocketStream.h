// The socket to the daemon, with what waits to be written and what was read of a frame.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

namespace tal::clientlib {

/// Never blocks and never raises SIGPIPE. Lives on the library's thread, close() in a child process apart.
class SocketStream {
 public:
  enum class Io { Done, WouldBlock, Ended };

  SocketStream() = default;
  ~SocketStream() { close(); }
  SocketStream(const SocketStream&) = delete;
  SocketStream& operator=(const SocketStream&) = delete;

  /// 0, or why nobody is connected.
  int open(const std::string& path);
  void close();
  int fd() const { return fd_.load(std::memory_order_relaxed); }

  /// Room for `bytes` at the end of what waits to be written; finish with commit().
  unsigned char* reserve(std::size_t bytes);
  void commit(std::size_t bytes) { outEnd_ += bytes; }
  std::size_t unsent() const { return outEnd_ - outBegin_; }
  /// Bytes of this connection that were written, and those and what still waits.
  std::uint64_t sentBytes() const { return sent_; }
  std::uint64_t queuedBytes() const { return sent_ + unsent(); }
  /// Writes what waits: Done when nothing is left.
  Io send();

  /// Reads what is there: WouldBlock when that is all for now.
  Io receive();
  enum class Frame { Got, Incomplete, Bad };
  /// The next frame's content, valid until the next call of receive().
  Frame nextFrame(std::span<const unsigned char>& frame);

  /// The errno of the last Io::Ended; 0 where the daemon closed the connection.
  int error() const { return error_; }

 private:
  std::atomic<int> fd_{-1};
  std::vector<unsigned char> out_;
  std::size_t outBegin_ = 0;
  std::size_t outEnd_ = 0;
  std::uint64_t sent_ = 0;
  std::vector<unsigned char> in_;
  std::size_t inBegin_ = 0;
  std::size_t inEnd_ = 0;
  int error_ = 0;
};

}  // namespace tal::clientlib
