// The library's thread: connects, writes, reads, waits.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "client/Exchange.h"
#include "client/Listener.h"
#include "client/LossReport.h"
#include "client/Outbox.h"
#include "client/Progress.h"
#include "client/Reconnection.h"
#include "client/SocketStream.h"

namespace tal::clientlib {

/// Away: waits for the next attempt. Greeting: connected, waits for the answer to its hello; nothing else is
/// sent before the daemon has shown that it speaks this protocol. Ready: sends.
class Courier {
 public:
  using Clock = std::chrono::steady_clock;

  struct Settings {
    std::vector<std::string> paths;
    bool durable = false;
    std::chrono::milliseconds reconnectMin{};
    std::chrono::milliseconds reconnectMax{};
    std::chrono::milliseconds pollInterval{};
    tal_callbacks callbacks{};
  };

  Courier(Outbox& outbox, Progress& progress, Settings settings);

  /// The thread's work: returns when it has been told to finish.
  void run();

  /// Any thread: finish when the queue has been answered, at the latest at `end`.
  void finishBy(Clock::time_point end);
  /// The library's thread, in a callback: finish as soon as the callback returns, and call no other.
  void finishNow();
  /// A child process: gives up the socket, which belongs to the parent.
  void forget() { stream_.close(); }

 private:
  enum class State { Away, Greeting, Ready };

  bool finished(Clock::time_point now) const;
  void attempt();
  void greet();
  void takeGreeting(const Reply& reply);
  void receive();
  void takeFrames();
  void send();
  void reportLosses(Clock::time_point now);
  void connectionLost(const tal_error& why);
  void scheduleAttempt();
  void sleep();
  std::optional<Clock::time_point> wakeAt(Clock::time_point now) const;

  Outbox& outbox_;
  Progress& progress_;
  const Settings settings_;
  Listener listener_;
  SocketStream stream_;
  Exchange exchange_;
  LossReport lossReport_;
  Reconnection reconnection_;
  std::mt19937_64 random_;

  State state_ = State::Away;
  Clock::time_point nextAttempt_{};
  Clock::time_point readySince_{};
  bool readable_ = false;
  /// The last error that the daemon gave before it closes a connection.
  std::optional<tal_error> refusal_;
  Reply reply_;
  std::atomic<Clock::rep> finishAt_{Clock::time_point::max().time_since_epoch().count()};
};

}  // namespace tal::clientlib
