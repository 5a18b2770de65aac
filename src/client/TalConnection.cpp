// The C interface to connections: their life, waiting, and the counts.
#include "client/TalConnection.h"

#include <algorithm>
#include <bit>
#include <csignal>
#include <cstring>
#include <memory>
#include <new>

#include "client/Errors.h"
#include "client/SocketPaths.h"

using namespace tal::clientlib;

namespace {

constexpr std::size_t kDefaultQueueBytes = std::size_t{2} << 20;
constexpr std::size_t kMinQueueBytes = std::size_t{64} << 10;
constexpr std::size_t kMaxQueueBytes = std::size_t{1} << 30;
constexpr std::size_t kDefaultFrameBytes = 1048576;
constexpr std::uint32_t kDefaultReconnectMinMs = 100;
constexpr std::uint32_t kDefaultReconnectMaxMs = 30000;
/// The thread's callbacks are the program's, so it gets what most threads need.
constexpr std::size_t kStackBytes = std::size_t{512} << 10;

/// The program's options with the defaults filled in; fields that an older program does not know are zero.
tal_options completed(const tal_options* given) {
  tal_options options{};
  if (given) std::memcpy(&options, given, std::min(given->struct_bytes, sizeof options));
  const auto fill = [](auto& field, auto value) {
    if (field == 0) field = value;
  };
  fill(options.queue_bytes, kDefaultQueueBytes);
  fill(options.max_frame_bytes, kDefaultFrameBytes);
  fill(options.reconnect_min_ms, kDefaultReconnectMinMs);
  fill(options.reconnect_max_ms, std::max(kDefaultReconnectMaxMs, options.reconnect_min_ms));
  return options;
}

/// What is wrong with the options, or null.
const char* fault(const tal_options* given, const tal_options& options) {
  if (given && given->struct_bytes == 0) return "tal_options.struct_bytes is not set";
  if (options.queue_bytes < kMinQueueBytes || options.queue_bytes > kMaxQueueBytes) {
    return "tal_options.queue_bytes is out of range";
  }
  if (options.reconnect_max_ms < options.reconnect_min_ms) {
    return "tal_options.reconnect_max_ms is less than reconnect_min_ms";
  }
  if (options.socket_path && std::strlen(options.socket_path) == 0) return "tal_options.socket_path is empty";
  return nullptr;
}

Courier::Settings courierSettings(const tal_options& options) {
  Courier::Settings settings;
  settings.paths = socketPaths(options.socket_path);
  settings.durable = options.durable_acknowledgement;
  settings.reconnectMin = std::chrono::milliseconds(options.reconnect_min_ms);
  settings.reconnectMax = std::chrono::milliseconds(options.reconnect_max_ms);
  settings.pollInterval = std::chrono::milliseconds(options.poll_interval_ms);
  settings.callbacks = options.callbacks;
  return settings;
}

}  // namespace

tal_connection::tal_connection(const tal_options& options)
    : outbox(std::bit_ceil(options.queue_bytes), options.max_frame_bytes, options.poll_interval_ms > 0),
      courier(outbox, progress, courierSettings(options)) {}

bool tal_connection::start() {
  pthread_attr_t attributes;
  if (pthread_attr_init(&attributes) != 0) return false;
  pthread_attr_setstacksize(&attributes, kStackBytes);
  // The thread inherits the mask, so that no signal of the program's ever runs on it.
  sigset_t all;
  sigset_t before;
  sigfillset(&all);
  pthread_sigmask(SIG_SETMASK, &all, &before);
  const int failed = pthread_create(&thread, &attributes, threadMain, this);
  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  pthread_attr_destroy(&attributes);
  return failed == 0;
}

void* tal_connection::threadMain(void* argument) {
  auto* connection = static_cast<tal_connection*>(argument);
  pthread_setname_np(pthread_self(), "talreporting");
  connection->self.store(pthread_self(), std::memory_order_relaxed);
  connection->courier.run();
  if (connection->freedInCallback) {
    pthread_detach(pthread_self());
    delete connection;
  }
  return nullptr;
}

void tal_connection::finish(std::uint32_t timeoutMs) {
  const std::lock_guard lock(finishing);
  if (finished) return;
  outbox.close();
  courier.finishBy(Courier::Clock::now() + std::chrono::milliseconds(timeoutMs));
  pthread_join(thread, nullptr);
  finished = true;
}

extern "C" {

const char* tal_status_text(tal_status status) noexcept {
  switch (status) {
    case TAL_OK:
      return "done";
    case TAL_QUEUE_FULL:
      return "the queue is full";
    case TAL_TOO_LARGE:
      return "larger than a frame or the queue may be";
    case TAL_INVALID:
      return "malformed message or argument";
    case TAL_CLOSED:
      return "the connection is closed";
    case TAL_TIMED_OUT:
      return "timed out";
    case TAL_WRONG_THREAD:
      return "would wait for itself: called from a callback";
    case TAL_OUT_OF_MEMORY:
      return "out of memory or threads";
    case TAL_REFUSED:
      return "refused by the daemon";
    case TAL_NOT_CONNECTED:
      return "no daemon is connected";
  }
  return "unknown status";
}

tal_connection* tal_connect(const tal_options* given, tal_error* error) noexcept try {
  const tal_options options = completed(given);
  if (const char* wrong = fault(given, options)) {
    if (error) *error = makeError(TAL_INVALID, 0, kClientDomain, wrong);
    return nullptr;
  }
  auto connection = std::make_unique<tal_connection>(options);
  if (!connection->start()) throw std::bad_alloc();
  return connection.release();
} catch (const std::exception&) {
  if (error) *error = localError(TAL_OUT_OF_MEMORY);
  return nullptr;
}

tal_status tal_wait_connected(tal_connection* connection, uint32_t timeout_ms, tal_error* error) noexcept {
  const tal_status status = !connection              ? TAL_INVALID
                            : connection->foreign()  ? TAL_CLOSED
                            : connection->onThread() ? TAL_WRONG_THREAD
                                                     : TAL_OK;
  if (status == TAL_OK) {
    return connection->progress.waitConnected(std::chrono::milliseconds(timeout_ms), error);
  }
  if (error) *error = localError(status);
  return status;
}

tal_status tal_flush(tal_connection* connection, uint32_t timeout_ms) noexcept {
  if (!connection) return TAL_INVALID;
  if (connection->foreign()) return TAL_CLOSED;
  if (connection->onThread()) return TAL_WRONG_THREAD;
  // Where sends ring no bell, the thread need not wait for its next look.
  connection->outbox.bell.ring();
  return connection->progress.waitReleased(connection->outbox.ring.reserved(),
                                           std::chrono::milliseconds(timeout_ms));
}

tal_status tal_connection_close(tal_connection* connection, uint32_t timeout_ms) noexcept {
  if (!connection) return TAL_INVALID;
  if (connection->foreign()) return TAL_CLOSED;
  if (connection->onThread()) {
    connection->outbox.close();
    connection->courier.finishNow();
    return TAL_WRONG_THREAD;
  }
  connection->finish(timeout_ms);
  const RecordRing& ring = connection->outbox.ring;
  return ring.released() == ring.reserved() ? TAL_OK : TAL_TIMED_OUT;
}

void tal_connection_free(tal_connection* connection) noexcept {
  if (!connection) return;
  if (connection->foreign()) {
    // The locks and the thread's stack are in whatever state the parent's threads left them in: they are not
    // touched, and their memory is given up. The socket must go, or the daemon would not notice the parent's
    // end.
    connection->courier.forget();
    return;
  }
  if (connection->onThread()) {
    connection->outbox.close();
    connection->courier.finishNow();
    connection->freedInCallback = true;
    return;
  }
  connection->finish(0);
  delete connection;
}

bool tal_on_library_thread(const tal_connection* connection) noexcept {
  return connection && !connection->foreign() && connection->onThread();
}

void tal_get_statistics(const tal_connection* connection, tal_statistics* statistics,
                        size_t struct_bytes) noexcept {
  if (!statistics) return;
  tal_statistics now{};
  if (connection) {
    const Counters& counters = connection->outbox.counters;
    const RecordRing& ring = connection->outbox.ring;
    const auto read = [](const auto& counter) { return counter.load(std::memory_order_relaxed); };
    now.connected = read(counters.connected);
    now.written = read(counters.written);
    now.resent = read(counters.resent);
    now.answered = read(counters.answered);
    now.dropped_refused = read(counters.refused);
    // Read after what it is the sum of, so that the difference is not negative.
    now.accepted = read(counters.accepted);
    now.dropped_queue_full = read(counters.droppedQueueFull);
    now.dropped_too_large = read(counters.droppedTooLarge);
    now.dropped_invalid = read(counters.droppedInvalid);
    if (read(counters.ended)) now.dropped_unanswered = now.accepted - now.answered - now.dropped_refused;
    now.dropped_closed = read(counters.droppedClosed);
    now.connects = read(counters.connects);
    now.failed_attempts = read(counters.failedAttempts);
    now.ignored_replies = read(counters.ignoredReplies);
    now.queue_bytes = ring.capacity();
    const auto released = ring.released();
    now.queue_used_bytes = ring.reserved() - released;
  }
  std::memcpy(statistics, &now, std::min(struct_bytes, sizeof now));
}

}  // extern "C"
