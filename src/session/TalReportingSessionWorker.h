#pragma once

// The contract between a session and its workers, the only place where messages
// turn into output.

#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "core/TalReportingSessionMessage.h"

namespace tal {

class TalReportingSession;
class TalReportingSessionWorkerConsumer;

/// One worker of one session. Lives on the reporting queue.
///
/// Life: created (`initWithSession` of its class) -> `start` -> `stop` -> `start` ...
/// -> destroyed with its session, stopped or not: the destructor takes back
/// whatever the worker has outside itself (observations, timers, queued work).
class TalReportingSessionWorker {
 public:
  TalReportingSessionWorker() = default;
  TalReportingSessionWorker(const TalReportingSessionWorker&) = delete;
  TalReportingSessionWorker& operator=(const TalReportingSessionWorker&) = delete;
  virtual ~TalReportingSessionWorker() = default;

  /// What becomes of `started`; nothing when the worker has no start of its own
  /// and is started all the same. One that answers false is offered `start`
  /// again at the session's next start.
  virtual std::optional<bool> start() { return std::nullopt; }

  /// Called at the session's stop, only when started. Producers derive their
  /// messages here and feed them back with `TalReportingSession::sendMessage`.
  virtual void stop() {}

  /// This worker as a consumer, or null.
  virtual TalReportingSessionWorkerConsumer* asConsumer() { return nullptr; }

  bool started() const { return started_; }
  /// For the session alone.
  void setStarted(bool started) { started_ = started; }

 private:
  bool started_ = false;
};

/// A worker that sees every message as it arrives.
class TalReportingSessionWorkerConsumer : public TalReportingSessionWorker {
 public:
  /// The record is the same object for every worker. Answers whether the worker
  /// claims the message; none does, and the session offers it to all.
  virtual bool handleMessage(const TalReportingSessionMessage::Pointer& message) = 0;

  /// True to receive messages that are marked redundant as well.
  virtual bool handleRedundantMessages() const { return false; }

  TalReportingSessionWorkerConsumer* asConsumer() final { return this; }
};

/// A class of workers: what the session asks before it makes one, and the state
/// that all workers of the class share. Lives as long as the process.
class TalReportingSessionWorkerClass {
 public:
  struct Traits {
    bool is_consumer = false;
    bool is_producer = false;
    /// Created and started with the session, not only at its start.
    bool start_on_init = false;
    /// Takes part in the service's single-message session.
    bool handle_single_message_session = false;
  };

  TalReportingSessionWorkerClass(std::string_view name, Traits traits) : name_(name), traits_(traits) {}
  TalReportingSessionWorkerClass(const TalReportingSessionWorkerClass&) = delete;
  TalReportingSessionWorkerClass& operator=(const TalReportingSessionWorkerClass&) = delete;
  virtual ~TalReportingSessionWorkerClass() = default;

  /// A worker for the session, which outlives it; or nothing where the class
  /// does not apply to the session: it is asked again at the session's next start.
  virtual std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) = 0;

  /// False leaves the class out of the roster for good.
  virtual bool answersInitWithSession() const { return true; }

  std::string_view name() const { return name_; }
  bool isConsumer() const { return traits_.is_consumer; }
  bool isProducer() const { return traits_.is_producer; }
  bool startOnInit() const { return traits_.start_on_init; }
  bool handleSingleMessageSession() const { return traits_.handle_single_message_session; }

 private:
  std::string_view name_;  // a literal
  Traits traits_;
};

}  // namespace tal
