#pragma once

// Workers that write down what happens to them, and the short rosters made of them.

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "session/TalReportingSession.h"
#include "session/WorkerRoster.h"

namespace tal::test {

using Journal = std::vector<std::string>;

/// How the workers of one class behave.
struct JournalWorkerOptions {
  std::string name;
  TalReportingSessionWorkerClass::Traits traits = {};
  /// What `start` answers, by attempt; the last answer stays. Empty: no start of its own.
  std::vector<bool> start_answers = {};
  bool handle_redundant = false;
  bool declines = false;
  bool lacks_init = false;
  std::function<void(TalReportingSession&)> on_stop = {};
};

class JournalWorker final : public TalReportingSessionWorkerConsumer {
 public:
  JournalWorker(TalReportingSession& session, const JournalWorkerOptions& options, Journal& journal)
      : session_(session), options_(options), journal_(journal) {}
  ~JournalWorker() override { journal_.push_back(options_.name + " gone"); }

  std::optional<bool> start() override {
    journal_.push_back(options_.name + " start");
    if (options_.start_answers.empty()) return std::nullopt;
    const bool answer = options_.start_answers[std::min(attempts_, options_.start_answers.size() - 1)];
    ++attempts_;
    return answer;
  }
  void stop() override {
    journal_.push_back(options_.name + " stop");
    if (options_.on_stop) options_.on_stop(session_);
  }
  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override {
    journal_.push_back(options_.name + " got " + message->message().find("audiotag")->text());
    return false;
  }
  bool handleRedundantMessages() const override { return options_.handle_redundant; }

 private:
  TalReportingSession& session_;
  const JournalWorkerOptions& options_;
  Journal& journal_;
  std::size_t attempts_ = 0;
};

class JournalWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  /// `options` and `journal` outlive the class.
  JournalWorkerClass(const JournalWorkerOptions& options, Journal& journal)
      : TalReportingSessionWorkerClass(options.name, options.traits), options_(options), journal_(journal) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override {
    journal_.push_back(options_.name + " init");
    if (options_.declines) return nullptr;
    return std::make_unique<JournalWorker>(session, options_, journal_);
  }
  bool answersInitWithSession() const override { return !options_.lacks_init; }

 private:
  const JournalWorkerOptions& options_;
  Journal& journal_;
};

/// `options` and `journal` outlive the roster.
inline std::unique_ptr<WorkerRoster> makeJournalRoster(const std::vector<JournalWorkerOptions>& options,
                                                       Journal& journal, const LogChannel& log) {
  std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
  for (const auto& each : options) classes.push_back(std::make_unique<JournalWorkerClass>(each, journal));
  return std::make_unique<WorkerRoster>(std::move(classes), log);
}

}  // namespace tal::test
