#pragma once

// What brokers are sent: the form of messages and topics, and which messages go
// together. No clock, no network.

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

namespace tal {

/// A message in the outbox.
struct OutboxMessage {
  std::int64_t number = 0;
  std::int64_t session = 0;  ///< row of the store
  double recorded_at = 0;    ///< seconds since 1970
  std::int64_t category = 0;
  std::int64_t type = 0;
  std::string payload;  ///< JSON
};

/// What is known of its session.
struct OutboxSession {
  std::int64_t identifier = 0;
  bool realtime = false;
  std::string session_info = "{}";  ///< JSON, as is the next
  std::string user_info = "{}";
};

struct Publication {
  std::string topic;
  std::string payload;
  std::vector<std::int64_t> numbers;
};

/// Messages of real-time sessions go one by one and at once, to
/// <prefix>/<reporter>/<category>/<type>; those of other sessions as arrays, to
/// <prefix>/<reporter>, once they are 256, their first one is a second old, or the
/// session is flushed. Messages of one session keep their order.
class Publications {
 public:
  using Instant = std::chrono::steady_clock::time_point;

  static constexpr std::size_t kMostMessages = 256;
  /// Brokers have limits of their own; one large message goes alone.
  static constexpr std::size_t kMostBytes = std::size_t{256} * 1024;
  static constexpr std::chrono::seconds kLongestWait{1};

  /// `prefix`: "<topic>/<device>".
  explicit Publications(std::string prefix) : prefix_(std::move(prefix)) {}

  /// `age`: for how long the message has waited already.
  void add(const OutboxMessage& message, const OutboxSession& session, Instant now,
           std::chrono::duration<double> age);
  void flush(std::int64_t session);
  void flushAll();

  /// The next one whose time has come.
  std::optional<Publication> takeDue(Instant now);
  /// When a batch will be due; nothing while there is none.
  std::optional<Instant> nextDue() const;

 private:
  struct Batch {
    Publication publication;
    Instant due;
  };
  void finish(Batch batch);

  std::string prefix_;
  std::unordered_map<std::int64_t, Batch> batches_;
  std::deque<Publication> ready_;
};

}  // namespace tal
