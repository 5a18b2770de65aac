#pragma once

// The capture service of this host: decides on requests, keeps timed ones, and has
// captures written elsewhere.

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/FlutterRequestService.h"
#include "platform/LifeToken.h"
#include "platform/ProcessTable.h"
#include "platform/SerialQueue.h"
#include "platform/SettingsStore.h"
#include "platform/SymptomReporterService.h"
#include "platform/linux/capture/CaptureThrottle.h"
#include "platform/linux/capture/CaptureWriter.h"

namespace tal {

/// Lives on the reporting queue, which it holds for the decision alone: the rest
/// is done on `work_queue`.
///
/// A snapshot is answered when it is written; a timed capture as it is opened,
/// before the request returns, and what becomes of it then only the log tells.
/// Refusals are answered later:
///
/// | kHoundDiagError… | when |
/// |---|---|
/// | InvalidParameters | the signature is none of ours, or the duration makes no sense |
/// | RequestThrottled | the same signature less than 60 s ago |
/// | DailyLimitExceeded | as many captures in 24 hours as the setting allows |
/// | ServiceNotReady | too many are open or being written |
/// | ServiceUnavailable | it could not be written: the disk is full, for one |
/// | SessionNotFound | (in the log only) nothing open has that identifier |
class CaptureService final : public SymptomReporterFactory, public FlutterRequestService {
 public:
  struct Dependencies {
    SerialQueue& reporting_queue;
    SerialQueue& work_queue;
    const Clock& clock;
    const SettingsStore& settings;
    const ProcessTable& processes;
    const LogChannel& log;
    std::shared_ptr<const CaptureWriter> writer;
    /// The processes whose clients are connected. Called on the reporting queue.
    std::function<std::vector<std::int32_t>()> client_processes;
  };

  /// What the dependencies refer to outlives the service; the work queue's tasks
  /// may outlive it.
  explicit CaptureService(Dependencies dependencies);

  std::shared_ptr<SymptomReporterService> makeClient(SymptomContext context) override;

  /// A capture with the scheduler's state and the kernel's trace buffer beside the
  /// rest, under the same limits; a refusal stands in the log.
  void requestFlutter(FlutterRequest request) override;

 private:
  class Client;
  using Request = SymptomReporterService::Request;
  using Reply = SymptomReporterService::Reply;
  using Written = std::function<void(std::error_code)>;

  bool snapshot(Request request, std::shared_ptr<const SymptomContext> context);
  bool startSession(Request request, std::shared_ptr<const SymptomContext> context);
  void cancelSession(std::string_view identifier);

  /// Counts the capture and names it, or tells why not.
  std::optional<HoundDiagError> admit(CaptureOrder& order);
  std::string makeIdentifier(const MessageDict& signature, double now);
  void write(CaptureOrder order, const std::optional<MessageDict>& names_processes, Written written);
  void timeIsOver(const std::string& identifier);
  std::vector<std::int32_t> processesToLookAt(const std::optional<MessageDict>& payload) const;
  void keepThrottle();
  void answer(const Reply& reply, MessageDict response);
  void refuse(const Reply& reply, HoundDiagError reason);

  const Dependencies dependencies_;
  CaptureThrottle throttle_;
  std::map<std::string, CaptureOrder, std::less<>> open_;  // by identifier
  std::size_t being_written_ = 0;
  // Identifiers given out within the second that the last one bears.
  std::set<std::string, std::less<>> names_of_second_;
  LifeToken life_;
};

}  // namespace tal
