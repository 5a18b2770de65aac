// The library's thread: connects, writes, reads, waits.
#include "client/Courier.h"

#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <ctime>

#include "client/Errors.h"
#include "client/Requests.h"

namespace tal::clientlib {

namespace {

constexpr std::uint64_t kHelloCall = 1;
constexpr std::uint64_t kProtocolVersion = 1;

std::uint64_t seed() {
  std::random_device device;
  return std::uint64_t{device()} << 32 | device();
}

double secondsSince1970() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

}  // namespace

Courier::Courier(Outbox& outbox, Progress& progress, Settings settings)
    : outbox_(outbox),
      progress_(progress),
      settings_(std::move(settings)),
      listener_(settings_.callbacks),
      exchange_(outbox, stream_, listener_),
      reconnection_(settings_.reconnectMin, settings_.reconnectMax),
      random_(seed()) {}

void Courier::run() {
  while (true) {
    if (state_ == State::Away && Clock::now() >= nextAttempt_) attempt();
    if (readable_) receive();
    if (state_ != State::Away) send();
    exchange_.release();
    outbox_.queueDeferred();
    progress_.setReleased(outbox_.ring.released(), outbox_.hasDeferred());
    if (finished(Clock::now())) break;
    sleep();
  }
  stream_.close();
  outbox_.counters.connected.store(false, std::memory_order_relaxed);
  exchange_.abandon();
  outbox_.counters.ended.store(true, std::memory_order_release);
  progress_.end();
}

bool Courier::finished(Clock::time_point now) const {
  const auto end = finishAt_.load(std::memory_order_acquire);
  if (end == Clock::time_point::max().time_since_epoch().count()) return false;
  if (now.time_since_epoch().count() >= end) return true;
  return outbox_.ring.released() == outbox_.ring.reserved() && !outbox_.hasDeferred();
}

void Courier::finishBy(Clock::time_point end) {
  finishAt_.store(end.time_since_epoch().count(), std::memory_order_release);
  outbox_.bell.ring();
}

void Courier::finishNow() {
  listener_.mute();
  finishBy(Clock::time_point::min());
}

void Courier::attempt() {
  std::string where;
  int error = 0;
  for (const std::string& path : settings_.paths) {
    error = stream_.open(path);
    if (error == 0) return greet();
    where += (where.empty() ? "no daemon at " : " or ") + path;
  }
  outbox_.counters.failedAttempts.fetch_add(1, std::memory_order_relaxed);
  const tal_error why = systemError(TAL_NOT_CONNECTED, error, where);
  scheduleAttempt();
  progress_.setDisconnected(why);
  listener_.trouble(why);
}

void Courier::greet() {
  state_ = State::Greeting;
  refusal_.reset();
  SmallCbor<64> arguments;
  arguments.number(kProtocolVersion);
  if (settings_.durable) arguments.map(1).text("acknowledge").text("durable");
  const std::size_t bytes = arguments.bytes().size();
  unsigned char* target = stream_.reserve(kFrameLengthBytes + kRequestHeadBytes + bytes);
  const std::size_t head = writeRequestHead(target, TAL_HELLO, kHelloCall, settings_.durable ? 2 : 1, bytes);
  std::copy(arguments.bytes().begin(), arguments.bytes().end(), target + head);
  stream_.commit(head + bytes);
}

void Courier::takeGreeting(const Reply& reply) {
  if (reply.failed) {
    refusal_ = reply.error;
    // Not admitted, or another version: the daemon may well leave the connection open.
    if (reply.call == kHelloCall) connectionLost(reply.error);
    return;
  }
  if (reply.call != kHelloCall) return;
  if (reply.result != Reply::Result::Map || reply.version != kProtocolVersion) {
    return connectionLost(makeError(TAL_REFUSED, 0, kClientDomain, "the daemon speaks another protocol"));
  }
  state_ = State::Ready;
  readySince_ = Clock::now();
  outbox_.counters.connects.fetch_add(1, std::memory_order_relaxed);
  outbox_.counters.connected.store(true, std::memory_order_relaxed);
  exchange_.begin(kHelloCall + 1);
  progress_.setConnected();
  listener_.connected(reply.server);
}

void Courier::receive() {
  SocketStream::Io io = SocketStream::Io::Done;
  while (state_ != State::Away && io == SocketStream::Io::Done) {
    io = stream_.receive();
    takeFrames();
  }
  if (state_ == State::Away || io != SocketStream::Io::Ended) return;
  connectionLost(refusal_ ? *refusal_
                 : stream_.error() == 0
                     ? makeError(TAL_NOT_CONNECTED, 0, kClientDomain, "the daemon closed the connection")
                     : systemError(TAL_NOT_CONNECTED, stream_.error(), "reading from the daemon"));
}

void Courier::takeFrames() {
  std::span<const unsigned char> frame;
  while (state_ != State::Away) {
    const SocketStream::Frame got = stream_.nextFrame(frame);
    if (got == SocketStream::Frame::Incomplete) return;
    if (got == SocketStream::Frame::Bad || !decodeReply(frame, reply_)) {
      return connectionLost(
          makeError(TAL_NOT_CONNECTED, 0, kClientDomain, "what the daemon sent is no reply"));
    }
    if (state_ == State::Greeting) {
      takeGreeting(reply_);
    } else {
      const bool fatal = reply_.failed && reply_.call == 0 && reply_.error.code == kFrameSizeCode;
      if (fatal) refusal_ = reply_.error;
      exchange_.handle(reply_);
    }
  }
}

void Courier::send() {
  if (state_ == State::Ready) {
    exchange_.stage();
    if (!exchange_.hasMore()) reportLosses(Clock::now());
  }
  if (stream_.send() == SocketStream::Io::Ended) {
    // What the daemon answered before it closed the connection is still to be read, lest it be sent again.
    const int error = stream_.error();
    receive();
    if (state_ != State::Away) connectionLost(systemError(TAL_NOT_CONNECTED, error, "writing to the daemon"));
  }
  exchange_.noteWritten();
}

void Courier::reportLosses(Clock::time_point now) {
  const auto due = lossReport_.due(outbox_.counters);
  if (!due || *due > now) return;
  const auto session = exchange_.firstStartedSession();
  if (!session) return;
  const LossReport::Losses losses = lossReport_.begin(outbox_.counters, now);
  SmallCbor<512> arguments;
  arguments.map(7);
  arguments.text("client_dropped_messages").number(losses.all());
  arguments.text("client_dropped_queue_full").number(losses.queueFull);
  arguments.text("client_dropped_too_large").number(losses.tooLarge);
  arguments.text("client_dropped_invalid").number(losses.invalid);
  arguments.text("client_dropped_refused").number(losses.refused);
  arguments.text("client_reconnects").number(outbox_.counters.connects.load(std::memory_order_relaxed) - 1);
  arguments.text("talreporting_timestamp").real(secondsSince1970());
  arguments.number(TAL_CATEGORY_GENERIC).number(TAL_TYPE_ERROR).array(1).integer(*session);
  // A report that is refused is not repeated: it would be refused again.
  exchange_.sendOwn(TAL_SEND_MESSAGE, arguments.bytes(), [this](bool) { lossReport_.answered(); });
}

void Courier::connectionLost(const tal_error& why) {
  const bool wasReady = state_ == State::Ready;
  stream_.close();
  readable_ = false;
  state_ = State::Away;
  exchange_.connectionBroke();
  lossReport_.connectionBroke();
  outbox_.counters.connected.store(false, std::memory_order_relaxed);
  if (wasReady) {
    reconnection_.connectionEnded(
        std::chrono::duration_cast<Reconnection::Duration>(Clock::now() - readySince_));
  } else {
    outbox_.counters.failedAttempts.fetch_add(1, std::memory_order_relaxed);
  }
  scheduleAttempt();
  tal_error told = why;
  // Having been admitted once, it is a matter of trying again.
  if (wasReady) told.status = TAL_NOT_CONNECTED;
  progress_.setDisconnected(told);
  if (wasReady) {
    listener_.disconnected(why);
  } else {
    listener_.trouble(why);
  }
}

void Courier::scheduleAttempt() {
  nextAttempt_ = Clock::now() + reconnection_.nextPause(std::uniform_real_distribution<>(0, 1)(random_));
}

std::optional<Courier::Clock::time_point> Courier::wakeAt(Clock::time_point now) const {
  std::optional<Clock::time_point> at;
  const auto consider = [&at](Clock::time_point when) { at = at ? std::min(*at, when) : when; };
  if (state_ == State::Away) consider(nextAttempt_);
  if (state_ == State::Ready) {
    if (settings_.pollInterval.count() > 0) consider(now + settings_.pollInterval);
    // While more is to be written, the socket wakes the thread, and the report waits.
    const auto due = lossReport_.due(outbox_.counters);
    if (due && !exchange_.hasMore() && exchange_.firstStartedSession()) consider(*due);
  }
  const Clock::time_point end{Clock::duration(finishAt_.load(std::memory_order_acquire))};
  if (end != Clock::time_point::max()) consider(end);
  return at;
}

void Courier::sleep() {
  const auto now = Clock::now();
  std::optional<Clock::time_point> at = wakeAt(now);
  if (state_ == State::Ready && stream_.unsent() == 0) {
    outbox_.bell.arm();
    // Something that was queued before the bell was armed did not ring it.
    if (exchange_.hasMore()) at = now;
  }
  timespec timeout{};
  if (at && *at > now) {
    const auto wait = std::chrono::duration_cast<std::chrono::nanoseconds>(*at - now);
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(wait);
    timeout.tv_sec = seconds.count();
    timeout.tv_nsec = (wait - seconds).count();
  }
  pollfd fds[2] = {{outbox_.bell.fd(), POLLIN, 0}, {stream_.fd(), POLLIN, 0}};
  if (stream_.unsent() > 0) fds[1].events |= POLLOUT;
  // poll() passes over the negative descriptor of a stream that is not open.
  const int ready = ppoll(fds, 2, at ? &timeout : nullptr, nullptr);
  outbox_.bell.disarm();
  readable_ = ready > 0 && (fds[1].revents & (POLLIN | POLLHUP | POLLERR)) != 0;
  if (ready > 0 && fds[0].revents != 0) outbox_.bell.quieten();
}

}  // namespace tal::clientlib
