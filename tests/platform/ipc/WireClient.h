#pragma once

// A client as the tests drive it: bytes out, frames in.

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "core/MessageDict.h"
#include "wire/CborWriter.h"
#include "wire/FrameSplitter.h"
#include "wire/WireProtocol.h"

namespace tal::test {

struct Null {};

inline void writeItem(CborWriter& writer, Null) { writer.null(); }
inline void writeItem(CborWriter& writer, bool value) { writer.boolean(value); }
inline void writeItem(CborWriter& writer, int value) { writer.signedInteger(value); }
inline void writeItem(CborWriter& writer, std::uint64_t value) { writer.unsignedInteger(value); }
inline void writeItem(CborWriter& writer, const char* value) { writer.text(value); }
inline void writeItem(CborWriter& writer, const MessageDict& value) { writer.dict(value); }
inline void writeItem(CborWriter& writer, const std::vector<int>& values) {
  writer.array(values.size());
  for (const int value : values) writer.signedInteger(value);
}

/// The bytes of one array of these items.
template <typename... Items>
std::string arrayOf(const Items&... items) {
  std::string out;
  CborWriter writer(out);
  writer.array(sizeof...(items));
  (writeItem(writer, items), ...);
  return out;
}

inline std::string frameOf(std::string_view content) {
  std::string out;
  CborWriter writer(out);
  const std::size_t begin = writer.beginFrame();
  out += content;
  writer.endFrame(begin);
  return out;
}

/// A request's frame.
template <typename... Arguments>
std::string request(Operation operation, int call, const Arguments&... arguments) {
  return frameOf(arrayOf(static_cast<int>(operation), call, arguments...));
}

/// The content of a successful reply's frame.
template <typename Result>
std::string success(int call, const Result& result) {
  return arrayOf(call, 0, result);
}

/// Ends on any failure by an exception. What it waits for has a generous limit,
/// so that a fault ends the test instead of hanging it.
class WireClient {
 public:
  explicit WireClient(const std::filesystem::path& path)
      : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
    if (::connect(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
      ::close(socket_);
      throw std::runtime_error(std::string("connect: ") + std::strerror(errno));
    }
  }
  WireClient(const WireClient&) = delete;
  WireClient& operator=(const WireClient&) = delete;
  ~WireClient() { close(); }

  void close() {
    if (socket_ >= 0) ::close(std::exchange(socket_, -1));
  }
  void endSending() const { ::shutdown(socket_, SHUT_WR); }

  void send(std::string_view bytes) {
    while (!bytes.empty()) bytes.remove_prefix(sendSome(bytes, kGenerous));
  }
  /// Sends as much as is taken until nothing is taken for a moment.
  std::size_t sendUntilRefused(std::string_view bytes) {
    constexpr int kMomentMs = 300;
    std::size_t sent = 0;
    while (sent < bytes.size()) {
      const std::size_t count = sendSome(bytes.substr(sent), kMomentMs);
      if (count == 0) break;
      sent += count;
    }
    return sent;
  }

  /// The content of the next frame; nothing at the end of the stream.
  std::optional<std::string> receive() {
    for (;;) {
      const FrameSplitter::Result result = splitter_.next();
      if (result.status == FrameSplitter::Status::kFrame) return std::string(result.content);
      if (result.status == FrameSplitter::Status::kBadLength)
        throw std::runtime_error("bad frame from the server");
      if (!waitFor(POLLIN, kGenerous)) throw std::runtime_error("nothing came");
      const ssize_t count = ::recv(socket_, buffer_, sizeof buffer_, 0);
      if (count <= 0) return std::nullopt;
      splitter_.feed({buffer_, static_cast<std::size_t>(count)});
    }
  }

  /// Sends a request and returns the content of the next frame.
  template <typename... Arguments>
  std::string ask(Operation operation, int call, const Arguments&... arguments) {
    send(request(operation, call, arguments...));
    return receive().value_or("the connection ended");
  }

 private:
  static constexpr int kGenerous = 60'000;

  bool waitFor(short events, int milliseconds) {
    pollfd state{.fd = socket_, .events = events, .revents = 0};
    return ::poll(&state, 1, milliseconds) == 1;
  }
  std::size_t sendSome(std::string_view bytes, int milliseconds) {
    const ssize_t count = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count > 0) return static_cast<std::size_t>(count);
    if (errno != EAGAIN) throw std::runtime_error(std::string("send: ") + std::strerror(errno));
    if (waitFor(POLLOUT, milliseconds)) return sendSome(bytes, milliseconds);
    if (milliseconds == kGenerous) throw std::runtime_error("nothing is taken");
    return 0;
  }

  int socket_;
  FrameSplitter splitter_;
  char buffer_[65536];
};

}  // namespace tal::test
