#include "platform/linux/callstat/MqttPublisher.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <fstream>
#include <utility>

namespace tal {

namespace {

using namespace std::chrono_literals;

// Read ahead of what the broker has confirmed, so that neither side waits.
constexpr std::size_t kMostUnconfirmed = 8192;
constexpr std::size_t kMostUnconfirmedBytes = std::size_t{8} * 1024 * 1024;
// Past this many flushes that nobody has looked at, the second that a batch waits
// at most has to do.
constexpr std::size_t kMostFlushes = 1024;
constexpr std::int64_t kMostReadAtOnce = 1024;
// A committed row is seen this soon, as long as one is awaited.
constexpr auto kLookForCommit = 10ms;
// How often the store is told of confirmations in a stream of them.
constexpr auto kTellStoreEvery = 100ms;
constexpr auto kConnectFor = 30s;
// A connection that nothing needs costs the broker more than making a new one.
constexpr auto kIdleBeforeLeaving = 60s;
constexpr auto kFirstPause = 500ms;
constexpr auto kLongestPause = 60s;
constexpr unsigned kMostDoublings = 7;

}  // namespace

MqttPublisher::MqttPublisher(OutboxPublishers::Dependencies dependencies, BrokerAddress address)
    : dependencies_(std::move(dependencies)),
      address_(std::move(address)),
      wake_(::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC)),
      random_(std::random_device{}()) {
  constexpr std::string_view kHex = "0123456789abcdef";
  client_id_ = "tal-";
  for (int i = 0; i < 16; ++i) client_id_ += kHex[random_() >> 8 & 15];
  thread_ = std::thread([this] {
    pthread_setname_np(pthread_self(), "mqtt");
    run();
  });
}

MqttPublisher::~MqttPublisher() {
  stopping_ = true;
  news_ = false;
  messageWaits();
  thread_.join();
  ::close(wake_);
}

void MqttPublisher::messageWaits() {
  if (news_.exchange(true)) return;
  constexpr std::uint64_t kOne = 1;
  // Refused only when it is full of wake-ups already.
  [[maybe_unused]] const auto written = ::write(wake_, &kOne, sizeof kOne);
}

void MqttPublisher::flush(std::int64_t session) {
  {
    const std::lock_guard lock(flush_mutex_);
    if (flush_.size() < kMostFlushes) flush_.push_back(session);
  }
  messageWaits();
}

void MqttPublisher::run() {
  while (!stopping_) {
    try {
      step();
    } catch (const StoreError& error) {
      reader_.reset();
      disconnect(std::string("the outbox cannot be read: ") + error.what(), std::chrono::steady_clock::now());
    }
    waitForEvents(std::chrono::steady_clock::now());
  }
  tellStore(told_at_ + kTellStoreEvery);
}

void MqttPublisher::step() {
  const Instant now = std::chrono::steady_clock::now();
  if (news_.exchange(false)) {
    has_read_all_ = false;
    awaited_row_ = dependencies_.store.sequence();
  }
  if (!connection_) {
    if (mayHaveMore() && now >= next_attempt_) connect(now);
    return;
  }
  if (!connection_->isUp()) {
    if (now >= attempt_ends_) disconnect("no answer", now);
    return;
  }
  readOutbox(now);
  publishDue(now);
  tellStore(now);
  leaveWhenIdle(now);
}

bool MqttPublisher::mayHaveMore() const { return !has_read_all_ || !unconfirmed_.empty(); }

bool MqttPublisher::hasRoom() const {
  return unconfirmed_.size() < kMostUnconfirmed && unconfirmed_bytes_ < kMostUnconfirmedBytes;
}

void MqttPublisher::connect(Instant now) {
  if (!reader_) reader_ = std::make_unique<OutboxReader>(dependencies_.store_path);
  // Everything from here on; what was under way in an earlier connection as well.
  const bool is_settled = dependencies_.store.settledThrough() >= awaited_row_;
  told_through_ = read_through_ = std::max(told_through_, reader_->confirmedBy(address_.uri));
  in_flight_.clear();
  unconfirmed_.clear();
  unconfirmed_bytes_ = 0;
  if (reader_->readAfter(read_through_, 1).empty()) {
    has_read_all_ = is_settled;
    next_attempt_ = now + kLookForCommit;
    return;
  }
  const CallstatSettings settings = dependencies_.settings.read();
  publications_.emplace(settings.topic + '/' + settings.device);
  connection_ = std::make_unique<MqttConnection>(MqttConnection::Options{.host = address_.host,
                                                                         .port = address_.port,
                                                                         .tls = address_.tls,
                                                                         .ca_file = settings.ca_file,
                                                                         .client_id = client_id_,
                                                                         .username = settings.username,
                                                                         .password = passwordOf(settings)},
                                                 [this](int identifier) { confirmed(identifier); });
  attempt_ends_ = now + kConnectFor;
  idle_since_ = attempt_ends_;
  has_read_all_ = false;
  if (const auto error = connection_->open()) disconnect(*error, now);
}

std::string MqttPublisher::passwordOf(const CallstatSettings& settings) const {
  std::string password;
  if (settings.password_file.empty()) return password;
  std::ifstream file(settings.password_file);
  if (!std::getline(file, password)) {
    TAL_LOG_ERROR(dependencies_.log, "password_file ", settings.password_file, " cannot be read");
  }
  return password;
}

void MqttPublisher::readOutbox(Instant now) {
  std::vector<std::int64_t> flush;
  {
    const std::lock_guard lock(flush_mutex_);
    // Only once what was sent before the flush can be read.
    if (dependencies_.store.settledThrough() >= awaited_row_) flush = std::exchange(flush_, {});
  }
  while (!has_read_all_ && hasRoom()) {
    const bool is_settled = dependencies_.store.settledThrough() >= awaited_row_;
    const auto messages = reader_->readAfter(read_through_, kMostReadAtOnce);
    for (const OutboxMessage& message : messages) {
      const double age = dependencies_.clock.secondsSince1970() - message.recorded_at;
      publications_->add(message, reader_->sessionOf(message.session), now,
                         std::chrono::duration<double>(age));
      unconfirmed_.emplace(message.number, message.payload.size());
      unconfirmed_bytes_ += message.payload.size();
      read_through_ = message.number;
    }
    if (messages.empty()) {
      has_read_all_ = is_settled;
      break;
    }
  }
  for (const std::int64_t session : flush) publications_->flush(session);
  // There is no room for what would fill the batches.
  if (!hasRoom()) publications_->flushAll();
}

void MqttPublisher::publishDue(Instant now) {
  while (auto publication = publications_->takeDue(now)) {
    int identifier = 0;
    if (const auto error = connection_->publish(publication->topic, publication->payload, identifier)) {
      return disconnect(*error, now);
    }
    in_flight_.emplace(identifier, std::move(publication->numbers));
  }
}

void MqttPublisher::confirmed(int identifier) {
  const auto found = in_flight_.find(identifier);
  if (found == in_flight_.end()) return;
  for (const std::int64_t number : found->second) {
    const auto message = unconfirmed_.find(number);
    unconfirmed_bytes_ -= message->second;
    unconfirmed_.erase(message);
  }
  in_flight_.erase(found);
  failures_ = 0;
}

void MqttPublisher::tellStore(Instant now) {
  const std::int64_t through = unconfirmed_.empty() ? read_through_ : unconfirmed_.begin()->first - 1;
  if (through <= told_through_) return;
  if (!unconfirmed_.empty() && now < told_at_ + kTellStoreEvery) return;
  told_through_ = through;
  told_at_ = now;
  dependencies_.store.append({.table = StoreTable::kRtcConfirmed, .number = through, .name = address_.uri});
}

void MqttPublisher::leaveWhenIdle(Instant now) {
  if (mayHaveMore()) {
    idle_since_ = now;
  } else if (now >= idle_since_ + kIdleBeforeLeaving) {
    connection_.reset();
  }
}

void MqttPublisher::disconnect(const std::string& reason, Instant now) {
  const bool was_up = connection_ && connection_->isUp();
  connection_.reset();
  tellStore(now + kTellStoreEvery);
  has_read_all_ = false;
  // Devices that lost one broker together should not come back together.
  const auto pause = std::min<std::chrono::milliseconds>(
      kFirstPause * (1U << std::min(failures_++, kMostDoublings)), kLongestPause);
  next_attempt_ = now + pause / 2 + pause / 2 * (random_() & 1023U) / 1024;
  complain((was_up ? "the connection was lost: " : "it cannot be reached: ") + reason);
}

void MqttPublisher::complain(const std::string& reason) {
  if (complaints_.allows(dependencies_.clock.monotonic())) {
    TAL_LOG_ERROR(dependencies_.log, "broker ", address_.uri, ": ", reason,
                  "; messages wait in the outbox and it is tried again");
  }
}

int MqttPublisher::pauseUntilNextEvent(Instant now) const {
  constexpr int kForEver = -1;
  std::optional<Instant> next;
  const auto at = [&next](Instant time) { next = next ? std::min(*next, time) : time; };
  if (!connection_) {
    if (mayHaveMore()) at(next_attempt_);
  } else if (!connection_->isUp()) {
    at(attempt_ends_);
  } else {
    if (!has_read_all_ && hasRoom()) at(now + kLookForCommit);
    if (const auto due = publications_->nextDue()) at(*due);
    if (unconfirmed_.empty() && has_read_all_) at(idle_since_ + kIdleBeforeLeaving);
  }
  if (!next) return kForEver;
  const auto pause = std::chrono::ceil<std::chrono::milliseconds>(*next - now);
  return static_cast<int>(std::clamp<std::int64_t>(pause.count(), 0, 60'000));
}

void MqttPublisher::waitForEvents(Instant now) {
  if (stopping_) return;
  std::array<pollfd, 2> events{pollfd{.fd = wake_, .events = POLLIN, .revents = 0}, pollfd{}};
  nfds_t count = 1;
  if (connection_) {
    const short to_write = connection_->wantsToWrite() ? POLLOUT : 0;
    events[count++] = {
        .fd = connection_->socket(), .events = static_cast<short>(POLLIN | to_write), .revents = 0};
  }
  ::poll(events.data(), count, pauseUntilNextEvent(now));
  if (events[0].revents != 0) {
    std::uint64_t wake_ups = 0;
    [[maybe_unused]] const auto taken = ::read(wake_, &wake_ups, sizeof wake_ups);
  }
  if (count == 1) return;
  const auto ready = static_cast<unsigned short>(events[1].revents);
  const bool was_up = connection_->isUp();
  const auto error =
      connection_->serve((ready & (POLLIN | POLLHUP | POLLERR)) != 0, (ready & (POLLOUT | POLLERR)) != 0);
  if (error) return disconnect(*error, std::chrono::steady_clock::now());
  if (!was_up && connection_->isUp()) TAL_LOG(dependencies_.log, "connected to broker ", address_.uri);
}

}  // namespace tal
