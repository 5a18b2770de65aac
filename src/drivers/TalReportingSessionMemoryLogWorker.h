#pragma once

// Brings what the system's memory tools say into the log when a client asks for
// it: on internal builds, and for test sessions everywhere.

#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "platform/CommandShell.h"
#include "session/TalReportingSession.h"
#include "session/TalReportingSessionWorker.h"

namespace tal {

/// What is run for a capture.
struct MemoryLogCommands {
  std::string process_listing = "talresources";
  std::string zone_listing = "talresources --zones";
};

/// Lets one capture through in more than five seconds, whoever asks. Any thread.
class MemoryLogRateLimit {
 public:
  /// True when a capture may begin, which is then the last one.
  bool take(Clock::Instant now);

 private:
  std::mutex mutex_;
  std::optional<Clock::Instant> last_capture_;
};

/// Keeps nothing between messages. Holds the reporting queue until both tools,
/// which run on threads of their own, have ended.
class TalReportingSessionMemoryLogWorker final : public TalReportingSessionWorkerConsumer {
 public:
  /// All of them outlive the worker.
  TalReportingSessionMemoryLogWorker(TalReportingSession& session, const MemoryLogCommands& commands,
                                     MemoryLogRateLimit& rate_limit)
      : session_(session), commands_(commands), rate_limit_(rate_limit) {}

  bool handleMessage(const TalReportingSessionMessage::Pointer& message) override;
  bool handleRedundantMessages() const override { return true; }

 private:
  // Sessions stand for the system as a whole here: it has no channel of its own.
  const LogChannel& log() const { return session_.platform().log.session; }
  void writeInBlocks(std::string_view captured) const;

  TalReportingSession& session_;
  const MemoryLogCommands& commands_;
  MemoryLogRateLimit& rate_limit_;
};

class TalReportingSessionMemoryLogWorkerClass final : public TalReportingSessionWorkerClass {
 public:
  explicit TalReportingSessionMemoryLogWorkerClass(MemoryLogCommands commands = {})
      : TalReportingSessionWorkerClass("TalReportingSessionMemoryLogWorker",
                                       {.is_consumer = true, .start_on_init = true}),
        commands_(std::move(commands)) {}

  std::unique_ptr<TalReportingSessionWorker> initWithSession(TalReportingSession& session) override;

 private:
  const MemoryLogCommands commands_;
  MemoryLogRateLimit rate_limit_;
};

}  // namespace tal
