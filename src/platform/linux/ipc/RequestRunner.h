#pragma once

// Carries out the requests of one connection, in their order, on the reporting
// queue, and answers them.

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "platform/SerialQueue.h"
#include "platform/linux/ipc/DurableReplies.h"
#include "platform/linux/ipc/ReplyChannel.h"
#include "platform/linux/ipc/RequestBatch.h"
#include "service/TalReportingClientServerInstance.h"
#include "wire/ReplyEncoder.h"

namespace tal {

/// What all connections of one listener share.
struct RunnerContext {
  SerialQueue& queue;
  DurableReplies& durable_replies;
  /// The server's name in the reply to hello.
  const std::string server_name;
  /// The process ends: nothing is carried out any more.
  std::atomic<bool> killed{false};
};

/// One per connection. The I/O thread hands batches in; a turn on the queue
/// carries out a bounded number of requests and then goes to the end of the
/// queue, so that connections take turns.
///
/// While the client leaves too many replies unread, the runner rests until the
/// channel has room again.
class RequestRunner final : public DurableReplyHolder, public std::enable_shared_from_this<RequestRunner> {
 public:
  // Requests a connection may have waiting before its socket is not read any
  // further: enough that neither thread runs dry between two wake-ups. The read
  // that crosses a bound is still taken in whole.
  static constexpr std::size_t kMostWaitingRequests = 4096;
  static constexpr std::size_t kMostWaitingBytes = std::size_t{256} << 10;
  // What another connection may have to wait for: some 0.2 ms of messages.
  static constexpr std::size_t kMostRequestsPerTurn = 256;

  /// Called on the reporting queue; each has the I/O thread informed.
  struct Hooks {
    /// `submit` said that there is no room; now there is.
    std::function<void()> has_room;
    /// After `endInput`: every request has been carried out.
    std::function<void()> carried_out;
    /// After that: no reply is held back for the store any more.
    std::function<void()> settled;
  };

  /// `context` outlives the runner.
  RequestRunner(std::shared_ptr<TalReportingClientServerInstance> client, RunnerContext& context,
                std::shared_ptr<ReplyChannel> channel, Hooks hooks);

  // The I/O thread:

  /// An empty batch to fill.
  std::unique_ptr<RequestBatch> takeBatch();
  /// Hands a batch over. False when the connection's bound is reached: read no
  /// more until `has_room`.
  bool submit(std::unique_ptr<RequestBatch> batch);
  /// No batch follows.
  void endInput();

  // Any thread:

  /// The channel has room again, or nobody waits for replies any more.
  void resume();

  // The reporting queue:

  bool rowsSettled(std::uint64_t up_to) override;

 private:
  struct HeldReply {
    std::uint64_t call = 0;
    std::uint64_t first_row = 0;
    std::uint64_t last_row = 0;
  };

  void schedule();
  void run();
  bool nextBatch();
  void finishBatch();
  void finishTurn(bool rests);
  bool sendReplies();
  void tellIfSettled();

  // RequestOperations.cpp:
  void carryOut(RequestBatch::Entry& entry);
  void startSession(const Request& request);
  void sendMessage(Request& request);
  void answerMessage(std::uint64_t call);
  void hold(std::uint64_t call, std::uint64_t first_row, std::uint64_t last_row);
  void hello(const Request& request);

  const std::shared_ptr<TalReportingClientServerInstance> client_;
  RunnerContext& context_;
  const std::shared_ptr<ReplyChannel> channel_;
  const Hooks hooks_;

  // Shared with the I/O thread.
  std::mutex mutex_;
  std::deque<std::unique_ptr<RequestBatch>> waiting_;
  std::vector<std::unique_ptr<RequestBatch>> spare_;
  std::size_t waiting_requests_ = 0;
  std::size_t waiting_bytes_ = 0;
  bool scheduled_ = false;  // a turn is posted, or under way
  bool resting_ = false;    // until the channel has room
  bool room_came_ = false;  // since the turn began
  bool reader_waits_ = false;
  bool input_ended_ = false;

  // The reporting queue's own.
  std::unique_ptr<RequestBatch> batch_;
  std::size_t position_ = 0;
  bool running_ = false;
  bool durable_ = false;
  bool told_carried_out_ = false;
  bool told_settled_ = false;
  std::string replies_;
  ReplyEncoder encoder_{replies_};
  // What the service answered to the message under way; nothing before it has.
  std::optional<std::optional<ReportingError>> message_answer_;
  std::deque<HeldReply> held_;
  bool holds_new_ = false;
};

}  // namespace tal
