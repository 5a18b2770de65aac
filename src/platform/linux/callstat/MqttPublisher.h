#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <unordered_map>
#include <vector>

#include "platform/linux/callstat/MqttConnection.h"
#include "platform/linux/callstat/OutboxPublishers.h"
#include "platform/linux/callstat/OutboxReader.h"
#include "platform/linux/callstat/Publications.h"
#include "platform/linux/store/DiskTrouble.h"

namespace tal {

/// Takes the outbox to one broker, on a thread of its own.
///
/// What is sent is read from the store, committed rows only, and stays there until
/// the broker has confirmed it: the store keeps the number up to which the broker
/// has everything. After a lost connection or a restart it goes on behind that
/// number, so a message may come again, with the same number.
///
/// It connects when there is something to send and leaves a minute after the last
/// of it. While nothing waits, or the broker is away, it sleeps.
class MqttPublisher {
 public:
  /// What is referred to outlives the object. Starts the thread.
  MqttPublisher(OutboxPublishers::Dependencies dependencies, BrokerAddress address);
  MqttPublisher(const MqttPublisher&) = delete;
  MqttPublisher& operator=(const MqttPublisher&) = delete;
  /// Ends the thread. May wait for a look-up of the broker's name.
  ~MqttPublisher();

  const BrokerAddress& address() const { return address_; }

  /// Any thread, as is `flush`.
  void messageWaits();
  void flush(std::int64_t session);

 private:
  using Instant = std::chrono::steady_clock::time_point;

  void run();
  void step();
  void readOutbox(Instant now);
  bool mayHaveMore() const;
  bool hasRoom() const;
  void connect(Instant now);
  void publishDue(Instant now);
  void confirmed(int identifier);
  void tellStore(Instant now);
  void disconnect(const std::string& reason, Instant now);
  void leaveWhenIdle(Instant now);
  void waitForEvents(Instant now);
  int pauseUntilNextEvent(Instant now) const;
  std::string passwordOf(const CallstatSettings& settings) const;
  void complain(const std::string& reason);

  OutboxPublishers::Dependencies dependencies_;
  const BrokerAddress address_;
  const int wake_;  // an eventfd
  std::atomic<bool> stopping_ = false;
  std::atomic<bool> news_ = true;  // told and not looked at
  std::mutex flush_mutex_;
  std::vector<std::int64_t> flush_;

  // The thread's alone.
  std::unique_ptr<OutboxReader> reader_;
  std::unique_ptr<MqttConnection> connection_;
  std::optional<Publications> publications_;
  std::unordered_map<int, std::vector<std::int64_t>> in_flight_;
  std::map<std::int64_t, std::size_t> unconfirmed_;  // read, with their bytes
  std::size_t unconfirmed_bytes_ = 0;
  std::int64_t read_through_ = 0;
  std::int64_t told_through_ = 0;  // what the store knows
  std::uint64_t awaited_row_ = 0;  // of the store's writer: not committed when last looked
  bool has_read_all_ = false;
  unsigned failures_ = 0;
  Instant next_attempt_{};
  Instant attempt_ends_{};
  Instant idle_since_{};
  Instant told_at_{};
  std::string client_id_;
  std::minstd_rand random_;
  OncePerMinute complaints_;

  std::thread thread_;  // last: uses all of the above
};

}  // namespace tal
