#pragma once

// Turns every message of a session into analytics events, one named by category
// and type alone and one with the session's service name in front.

#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>

#include "platform/AnalyticsSink.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// The two names of each kind of message, made once: they would otherwise be put
/// together anew for every message. Lives on the reporting queue.
class TallyEventNames {
 public:
  struct Names {
    std::string generic;  ///< "org.vantle.talsys.<category>.<type>"
    std::string service;  ///< "org.vantle.<service>.<category>.<type>"
  };

  /// Valid until the next call.
  const Names& namesFor(AudioEventCategory category, AudioEventType type, AudioServiceType service);

 private:
  std::unordered_map<std::uint64_t, Names> names_;
};

/// Keeps nothing between messages.
class TalReportingSessionTallyWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// All three outlive the worker.
  TalReportingSessionTallyWorker(TalReportingSession& session, AnalyticsSink& sink, TallyEventNames& names)
      : session_(session), sink_(sink), names_(names) {}

  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;

 private:
  void send(const std::string& name, const TalReportingSessionMessage& message);

  TalReportingSession& session_;
  AnalyticsSink& sink_;
  TallyEventNames& names_;
};

class TalReportingSessionTallyWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  explicit TalReportingSessionTallyWorkerClass(AnalyticsSink& sink);

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;

 private:
  AnalyticsSink& sink_;
  TallyEventNames names_;
};

}  // namespace tal
