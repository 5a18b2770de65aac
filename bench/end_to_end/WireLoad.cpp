#include "end_to_end/WireLoad.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <stdexcept>

#include "wire/CborWriter.h"
#include "wire/FrameSplitter.h"

namespace tal::bench {

namespace {

// Any call but 0: the replies are counted, not told apart.
constexpr std::uint64_t kCall = 1;

}  // namespace

MessageDict playbackStart(int number) {
  return {{"session_output_running", true},
          {"RvSessionVolume", 0.0625 * (number % 17) + 0.001},
          {"active_devices", "Built-in Audio Analog Stereo"},
          {"session_selected_format", "S16LE 44100 Hz"},
          {"mFormatID", "raw"},
          {"mChannelsPerFrame", 2},
          {"stretch_index", number},
          {"talreporting_timestamp", MessageDate{1769870702.123456 + number}},
          {"session_duration", 12.5 + number},
          {"xrun_episodes", number % 3},
          {"xrun_starved_seconds", 0.01 * (number % 7)},
          {"issue_type", "overload"}};
}

std::string_view Requests::between(std::size_t first, std::size_t last) const {
  const std::size_t begin = first == 0 ? 0 : ends_[first - 1];
  const std::size_t end = last == 0 ? 0 : ends_[last - 1];
  return std::string_view(bytes_).substr(begin, end - begin);
}

void Requests::sendMessage(int number, std::int64_t reporter_id) {
  constexpr unsigned kCategoryPlayback = 4;
  constexpr unsigned kTypeStart = 1;
  CborWriter writer(bytes_);
  const std::size_t frame = writer.beginFrame();
  writer.array(6);
  writer.unsignedInteger(static_cast<std::uint64_t>(Operation::kSendMessage));
  writer.unsignedInteger(kCall);
  writer.dict(playbackStart(number));
  writer.unsignedInteger(kCategoryPlayback);
  writer.unsignedInteger(kTypeStart);
  writer.array(1);
  writer.signedInteger(reporter_id);
  writer.endFrame(frame);
  ends_.push_back(bytes_.size());
}

void Requests::hello(bool durable) {
  CborWriter writer(bytes_);
  const std::size_t frame = writer.beginFrame();
  writer.array(4);
  writer.unsignedInteger(static_cast<std::uint64_t>(Operation::kHello));
  writer.unsignedInteger(kCall);
  writer.unsignedInteger(kProtocolVersion);
  writer.map(1);
  writer.text(kAcknowledgeOption);
  writer.text(durable ? kAcknowledgeDurable : "");
  writer.endFrame(frame);
  ends_.push_back(bytes_.size());
}

void Requests::session(Operation operation, std::uint64_t call, std::int64_t reporter_id) {
  CborWriter writer(bytes_);
  const std::size_t frame = writer.beginFrame();
  writer.array(3);
  writer.unsignedInteger(static_cast<std::uint64_t>(operation));
  writer.unsignedInteger(call);
  writer.signedInteger(reporter_id);
  writer.endFrame(frame);
  ends_.push_back(bytes_.size());
}

void Requests::setServiceType(std::int64_t reporter_id) {
  constexpr unsigned kLongFormAudio = 7;
  CborWriter writer(bytes_);
  const std::size_t frame = writer.beginFrame();
  writer.array(4);
  writer.unsignedInteger(static_cast<std::uint64_t>(Operation::kSetServiceType));
  writer.unsignedInteger(0);
  writer.unsignedInteger(kLongFormAudio);
  writer.signedInteger(reporter_id);
  writer.endFrame(frame);
  ends_.push_back(bytes_.size());
}

Connection::Connection(const std::filesystem::path& socket_path)
    : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strncpy(address.sun_path, socket_path.c_str(), sizeof address.sun_path - 1);
  if (::connect(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    throw std::runtime_error(socket_path.string() + ": " + std::strerror(errno));
  }
}

Connection::~Connection() { ::close(socket_); }

void Connection::send(std::string_view bytes) const {
  while (!bytes.empty()) {
    const ssize_t count = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (count <= 0) throw std::runtime_error(std::string("send: ") + std::strerror(errno));
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
}

std::size_t Connection::receive() {
  char buffer[65536];
  const ssize_t count = ::recv(socket_, buffer, sizeof buffer, 0);
  if (count <= 0) throw std::runtime_error("the daemon ended the connection");
  const std::string_view bytes(buffer, static_cast<std::size_t>(count));
  if (rest_.empty()) return countReplies(bytes);
  const std::string whole = rest_.append(bytes);
  rest_.clear();
  return countReplies(whole);
}

std::size_t Connection::countReplies(std::string_view bytes) {
  std::size_t replies = 0;
  while (bytes.size() >= kFrameHeaderBytes) {
    std::uint32_t length = 0;
    std::memcpy(&length, bytes.data(), sizeof length);  // both ends are this machine
    if (bytes.size() - kFrameHeaderBytes < length) break;
    // [call, 0, …]: the calls used here take one byte.
    constexpr std::size_t kStatusAt = kFrameHeaderBytes + 2;
    if (bytes[kStatusAt] != 0) throw std::runtime_error("an error: " + std::string(bytes.substr(0, length)));
    bytes.remove_prefix(kFrameHeaderBytes + length);
    ++replies;
  }
  rest_ = bytes;
  return replies;
}

void Connection::exchange(const Requests& requests, std::size_t in_flight) {
  std::size_t sent = 0;
  std::size_t answered = 0;
  while (answered < requests.size()) {
    const std::size_t until = std::min(requests.size(), answered + in_flight);
    send(requests.between(sent, until));
    sent = until;
    answered += receive();
  }
}

}  // namespace tal::bench
