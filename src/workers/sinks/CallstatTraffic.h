#pragma once

// The RTC worker's side of its private queue: everything that talks to the
// back-end. Its lines are written under the worker's name.

#include <atomic>
#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/Log.h"
#include "core/MessageDict.h"
#include "core/TalReportingSessionMessage.h"
#include "platform/CallstatBackend.h"
#include "platform/SerialQueue.h"

namespace tal {

/// One worker's traffic with the back-end. `start`, `deliver`, `stop` and
/// `abandon` are called on the reporting queue and only hand work over; it is
/// carried out in that order on the private queue.
///
/// Life, on the private queue:
/// 1. `start` opens a back-end session and waits for its back-ends, at most 9
///    seconds. Waiting holds no thread: what comes meanwhile is held here.
/// 2. Back-ends found: messages are delivered. Otherwise every message until the
///    next `start` is dropped, for there is no second attempt.
/// 3. `stop` sends the summary, flushes and closes; `start` may follow.
///
/// Work that was handed over keeps the object alive, so that the messages of a
/// session that is released without a stop still reach the back-end.
class CallstatTraffic final : public std::enable_shared_from_this<CallstatTraffic> {
 public:
  struct Dependencies {
    CallstatBackend& backend;
    const LogChannel& log;
    std::shared_ptr<SerialQueue> queue;
    bool internal_build = false;
  };

  /// What a start needs of the session, as it was at the time.
  struct Opening {
    ReporterID reporter_id = 0;
    AudioServiceType service_type = AudioServiceType::kUnknown;
    std::string service_name;  ///< as the user info bears it
    MessageDict configuration;
  };

  /// What a stop needs of the session: a snapshot that nobody changes any more.
  struct Closing {
    ReporterID reporter_id = 0;
    AudioServiceType service_type = AudioServiceType::kUnknown;
    bool has_messages = false;            ///< the session kept any
    std::vector<MessageDict> summarised;  ///< those that belong in the summary, in order
  };

  explicit CallstatTraffic(Dependencies dependencies) : dependencies_(std::move(dependencies)) {}
  CallstatTraffic(const CallstatTraffic&) = delete;
  CallstatTraffic& operator=(const CallstatTraffic&) = delete;

  void start(Opening opening);
  void deliver(TalReportingSessionMessage::Pointer message);
  void stop(Closing closing);
  /// Closes the back-end session without a summary, after what was handed over.
  void abandon();

  /// True only while the back-end has confirmed a back-end. Any thread.
  bool callstatSessionStarted() const { return callstat_session_started_.load(std::memory_order_acquire); }

  /// True once the latest start has come to nothing: whatever is handed over
  /// until the next one will be dropped. On the reporting queue.
  bool isUnstartedForGood() const { return failed_start_.load(std::memory_order_acquire) == starts_; }

 private:
  enum class Wait {
    kNone,
    kAsking,    ///< the back-end is being asked, and may answer at once
    kWaiting,   ///< it will answer, or time runs out
    kAnswered,  ///< it has, and the wait is about to end
  };

  template <typename Work>
  void post(Work work);

  void startUp(std::uint64_t attempt, const Opening& opening);
  void backendsFound(std::uint64_t attempt, const std::vector<std::string>& backends);
  void waitTimedOut(std::uint64_t attempt);
  void endWait();
  void handleMessage(const TalReportingSessionMessage::Pointer& message);
  void sendMessage(TalReportingSessionMessage& message);
  void shutDown(const Closing& closing);
  void sendSummary(const Closing& closing);
  void close();

  Dependencies dependencies_;
  std::atomic<bool> callstat_session_started_ = false;
  std::atomic<std::uint64_t> failed_start_ = 0;
  std::uint64_t starts_ = 0;  // the reporting queue's alone

  // The private queue's alone.
  std::unique_ptr<CallstatSession> callstat_session_;
  std::optional<CallstatToken> callstat_agent_token_;
  std::uint64_t attempt_ = 0;  // the start at work: tells a late answer from one that is waited for
  Wait wait_ = Wait::kNone;
  std::list<std::function<void()>> held_;  // in order
};

}  // namespace tal
