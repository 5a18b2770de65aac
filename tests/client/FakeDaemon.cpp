// A daemon that does what the test tells it, one step at a time, on the test's own thread.
#include "client/FakeDaemon.h"

#include <cbor.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdlib>
#include <stdexcept>

#include "client/Diagnostic.h"

namespace tal::test {

namespace {

/// How long a step may take before the test fails; nothing is expected to come near it. Less than the ten
/// seconds that the library leaves between two reports of losses, lest one that is late pass for one that is
/// due.
constexpr int kPatienceMs = 8000;

void awaitReadable(int fd) {
  pollfd waiting{fd, POLLIN, 0};
  if (poll(&waiting, 1, kPatienceMs) <= 0) throw std::runtime_error("the client sent nothing");
}

/// The text of an argument list: that of the array without its first two items.
std::string argumentsOf(const std::string& array) {
  const std::size_t second = array.find(", ");
  const std::size_t third = array.find(", ", second + 2);
  if (third == std::string::npos) return "()";
  return "(" + array.substr(third + 2, array.size() - third - 3) + ")";
}

}  // namespace

bool FakePeer::fill(std::string& bytes, std::size_t size) const {
  bytes.resize(size);
  for (std::size_t at = 0; at < size;) {
    awaitReadable(fd_);
    const ssize_t got = ::read(fd_, bytes.data() + at, size - at);
    if (got <= 0) return false;
    at += static_cast<std::size_t>(got);
  }
  return true;
}

Request FakePeer::next() {
  std::string head;
  std::string body;
  if (!fill(head, 4)) throw std::runtime_error("the client closed the connection");
  std::size_t length = 0;
  for (int i = 3; i >= 0; --i)
    length = length << 8 | static_cast<unsigned char>(head[static_cast<std::size_t>(i)]);
  if (!fill(body, length)) throw std::runtime_error("the client broke off in mid-frame");
  const std::string text = diagnostic({reinterpret_cast<const unsigned char*>(body.data()), body.size()});
  Request request;
  std::size_t used = 0;
  request.operation = std::stoull(text.substr(1), &used);
  request.call = std::stoull(text.substr(used + 3));
  request.text = std::to_string(request.operation) + argumentsOf(text);
  return request;
}

std::vector<std::string> FakePeer::serve(std::size_t requests) {
  std::vector<std::string> texts;
  for (std::size_t i = 0; i < requests; ++i) {
    const Request request = next();
    texts.push_back(request.text);
    if (request.operation == TAL_SEND_MESSAGE) {
      reply(request.call, "\xF6");
    } else if (request.operation != TAL_START_SESSION) {
      reply(request.call);
    }
  }
  return texts;
}

void FakePeer::greet() {
  const Request hello = next();
  if (hello.operation != TAL_HELLO) throw std::runtime_error("no hello but " + hello.text);
  reply(hello.call, "\xA2" + cborText("version") + "\x01" + cborText("server") + cborText("fake 1"));
}

void FakePeer::awaitEnd() const {
  char bytes[4096];
  do {
    awaitReadable(fd_);
  } while (::read(fd_, bytes, sizeof bytes) > 0);
}

std::string FakePeer::frame(std::uint64_t call, const std::string& rest) {
  unsigned char head[9];
  const std::size_t bytes = cbor_encode_uint(call, head, sizeof head);
  const std::string body = "\x83" + std::string(reinterpret_cast<char*>(head), bytes) + rest;
  return std::string{static_cast<char>(body.size()), '\0', '\0', '\0'} + body;
}

std::string FakePeer::success(std::uint64_t call, const std::string& result) {
  return frame(call, std::string(1, '\0') + result);
}

void FakePeer::reply(std::uint64_t call, const std::string& result) const { sendRaw(success(call, result)); }

void FakePeer::replyError(std::uint64_t call, std::uint8_t code, const std::string& domain) const {
  sendRaw(frame(call, "\x01\xA3" + cborText("domain") + cborText(domain) + cborText("code") +
                          static_cast<char>(code) + cborText("message") + cborText("no")));
}

void FakePeer::sendRaw(const std::string& bytes) const {
  if (::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL) != static_cast<ssize_t>(bytes.size())) {
    throw std::runtime_error("the client does not read");
  }
}

void FakePeer::close() {
  if (fd_ >= 0) ::close(fd_);
  fd_ = -1;
}

FakeDaemon::FakeDaemon() {
  std::string name = std::filesystem::temp_directory_path() / "talclient.XXXXXX";
  if (!mkdtemp(name.data())) throw std::runtime_error("no temporary directory");
  directory_ = name;
  path_ = directory_ / "talreporting.sock";
}

FakeDaemon::~FakeDaemon() {
  leave();
  std::filesystem::remove_all(directory_);
}

void FakeDaemon::listen() {
  fd_ = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path_.copy(address.sun_path, path_.size());
  if (::bind(fd_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
      ::listen(fd_, 8) != 0) {
    throw std::runtime_error("cannot listen");
  }
}

void FakeDaemon::leave() {
  if (fd_ < 0) return;
  ::close(fd_);
  fd_ = -1;
  std::filesystem::remove(path_);
}

std::unique_ptr<FakePeer> FakeDaemon::accept() const {
  awaitReadable(fd_);
  return std::make_unique<FakePeer>(::accept4(fd_, nullptr, nullptr, SOCK_CLOEXEC));
}

std::unique_ptr<FakePeer> FakeDaemon::welcome() const {
  auto peer = accept();
  peer->greet();
  return peer;
}

}  // namespace tal::test
