// The socket to the daemon, with what waits to be written and what was read of a frame.
#include "client/SocketStream.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "client/Requests.h"

namespace tal::clientlib {

namespace {

constexpr std::size_t kReadBytes = std::size_t{64} << 10;
/// No reply comes near it: a list of all reporters takes nine bytes for each. It keeps a peer that is no
/// daemon from filling the memory.
constexpr std::size_t kMaxReplyBytes = std::size_t{16} << 20;
/// What a rare large frame made of a buffer is given back.
constexpr std::size_t kKeptBytes = std::size_t{256} << 10;

/// Moves what is still wanted to the front, and frees memory that is not.
void compact(std::vector<unsigned char>& buffer, std::size_t& begin, std::size_t& end) {
  if (begin > 0 && begin < end) std::memmove(buffer.data(), buffer.data() + begin, end - begin);
  end -= begin;
  begin = 0;
  if (end == 0 && buffer.size() > kKeptBytes) {
    buffer.resize(kKeptBytes);
    buffer.shrink_to_fit();
  }
}

}  // namespace

int SocketStream::open(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return ENAMETOOLONG;
  path.copy(address.sun_path, path.size());
  const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
  if (fd < 0) return errno;
  if (::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    const int error = errno;
    ::close(fd);
    return error;
  }
  fd_.store(fd, std::memory_order_relaxed);
  outBegin_ = outEnd_ = inBegin_ = inEnd_ = 0;
  sent_ = 0;
  return 0;
}

void SocketStream::close() {
  const int fd = fd_.exchange(-1, std::memory_order_relaxed);
  if (fd >= 0) ::close(fd);
}

unsigned char* SocketStream::reserve(std::size_t bytes) {
  if (out_.size() - outEnd_ < bytes) {
    compact(out_, outBegin_, outEnd_);
    if (out_.size() - outEnd_ < bytes) out_.resize(outEnd_ + bytes + out_.size() / 2);
  }
  return out_.data() + outEnd_;
}

SocketStream::Io SocketStream::send() {
  while (outBegin_ < outEnd_) {
    const ssize_t sent = ::send(fd(), out_.data() + outBegin_, outEnd_ - outBegin_, MSG_NOSIGNAL);
    if (sent < 0) {
      if (errno == EINTR) continue;
      if (errno == EAGAIN || errno == EWOULDBLOCK) return Io::WouldBlock;
      error_ = errno;
      return Io::Ended;
    }
    outBegin_ += static_cast<std::size_t>(sent);
    sent_ += static_cast<std::uint64_t>(sent);
  }
  compact(out_, outBegin_, outEnd_);
  return Io::Done;
}

SocketStream::Io SocketStream::receive() {
  compact(in_, inBegin_, inEnd_);
  if (in_.size() - inEnd_ < kReadBytes) in_.resize(inEnd_ + kReadBytes);
  while (true) {
    const std::size_t room = in_.size() - inEnd_;
    const ssize_t got = ::recv(fd(), in_.data() + inEnd_, room, 0);
    if (got > 0) {
      inEnd_ += static_cast<std::size_t>(got);
      return static_cast<std::size_t>(got) < room ? Io::WouldBlock : Io::Done;
    }
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 && (errno == EAGAIN || errno == EWOULDBLOCK)) return Io::WouldBlock;
    error_ = got == 0 ? 0 : errno;
    return Io::Ended;
  }
}

SocketStream::Frame SocketStream::nextFrame(std::span<const unsigned char>& frame) {
  const std::size_t held = inEnd_ - inBegin_;
  if (held < kFrameLengthBytes) return Frame::Incomplete;
  std::size_t length = 0;
  for (std::size_t i = 0; i < kFrameLengthBytes; ++i) {
    length |= static_cast<std::size_t>(in_[inBegin_ + i]) << (8 * i);
  }
  if (length == 0 || length > kMaxReplyBytes) return Frame::Bad;
  if (held < kFrameLengthBytes + length) return Frame::Incomplete;
  frame = {in_.data() + inBegin_ + kFrameLengthBytes, length};
  inBegin_ += kFrameLengthBytes + length;
  return Frame::Got;
}

}  // namespace tal::clientlib
