#include "platform/linux/capture/CaptureService.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <ctime>
#include <limits>
#include <utility>

#include "core/SafeFileName.h"
#include "platform/linux/capture/CaptureSettings.h"

namespace tal {

namespace {

// Each holds its session's last messages; more at once are of one and the same trouble.
constexpr std::size_t kMostOpen = 16;
constexpr std::size_t kMostBeingWritten = 4;
constexpr double kLongestDuration = 24 * 60 * 60;

constexpr MessageKey kDomain{"domain"};
constexpr MessageKey kType{"type"};
constexpr MessageKey kSubType{"subType"};
constexpr MessageKey kSubtypeContext{"subtypeContext"};
constexpr MessageKey kDetectedProcess{"detectedProcess"};
constexpr MessageKey kTriggerThresholdValues{"triggerThresholdValues"};

std::string_view textUnder(const MessageDict& dict, const MessageKey& key) {
  const MessageValue* value = dict.find(key);
  return value ? value->string() : std::string_view();
}

bool isSound(const SymptomReporterService::Request& request, double least_seconds) {
  const double seconds = request.duration_seconds;
  return !textUnder(request.signature, kDomain).empty() && !textUnder(request.signature, kType).empty() &&
         std::isfinite(seconds) && seconds >= least_seconds && seconds <= kLongestDuration;
}

// "20260131T144502Z"
std::string timeInName(double seconds_since_1970) {
  const auto seconds = static_cast<std::time_t>(seconds_since_1970);
  std::tm broken_down{};
  ::gmtime_r(&seconds, &broken_down);
  std::array<char, 32> text{};
  const std::size_t size = std::strftime(text.data(), text.size(), "%Y%m%dT%H%M%SZ", &broken_down);
  return {text.data(), size};
}

}  // namespace

/// What is made for one fault.
class CaptureService::Client final : public SymptomReporterService {
 public:
  Client(CaptureService& service, SymptomContext context)
      : service_(service), context_(std::make_shared<const SymptomContext>(std::move(context))) {}

  Signature signatureWithDomain(const SignatureFields& fields) override {
    Signature signature{{kDomain, fields.domain},
                        {kType, fields.type},
                        {kSubType, fields.sub_type},
                        {kSubtypeContext, fields.subtype_context},
                        {kDetectedProcess, fields.detected_process}};
    if (fields.trigger_threshold_values) {
      signature.set(kTriggerThresholdValues, *fields.trigger_threshold_values);
    }
    return signature;
  }
  bool snapshotWithSignature(Request request) override {
    return service_.snapshot(std::move(request), context_);
  }
  bool startSessionWithSignature(Request request) override {
    return service_.startSession(std::move(request), context_);
  }
  void cancelSession(std::string_view identifier) override { service_.cancelSession(identifier); }

 private:
  CaptureService& service_;
  const std::shared_ptr<const SymptomContext> context_;
};

CaptureService::CaptureService(Dependencies dependencies)
    : dependencies_(std::move(dependencies)), throttle_(dependencies_.writer->keptThrottle()) {
  dependencies_.work_queue.post([writer = dependencies_.writer] { writer->tidy(); });
}

std::shared_ptr<SymptomReporterService> CaptureService::makeClient(SymptomContext context) {
  return std::make_shared<Client>(*this, std::move(context));
}

bool CaptureService::snapshot(Request request, std::shared_ptr<const SymptomContext> context) {
  assertOnQueue(dependencies_.reporting_queue);
  if (!isSound(request, 0)) {
    refuse(request.reply, kHoundDiagErrorInvalidParameters);
    return false;
  }
  CaptureOrder order{.kind = "snapshot",
                     .signature = std::move(request.signature),
                     .payload = std::move(request.payload),
                     .context = std::move(context)};
  if (const auto reason = admit(order)) {
    refuse(request.reply, *reason);
    return true;
  }
  MessageDict success{{kHoundDiagReplySuccess, true}, {kHoundDiagReplySessionID, order.identifier}};
  const auto payload = order.payload;
  write(std::move(order), payload, [this, reply = std::move(request.reply), success](std::error_code error) {
    if (error) return refuse(reply, kHoundDiagErrorServiceUnavailable);
    answer(reply, success);
  });
  return true;
}

bool CaptureService::startSession(Request request, std::shared_ptr<const SymptomContext> context) {
  assertOnQueue(dependencies_.reporting_queue);
  if (!isSound(request, std::numeric_limits<double>::min())) {
    refuse(request.reply, kHoundDiagErrorInvalidParameters);
    return false;
  }
  CaptureOrder order{.kind = "timed",
                     .signature = std::move(request.signature),
                     .payload = std::move(request.payload),
                     .context = std::move(context)};
  if (open_.size() >= kMostOpen) {
    refuse(request.reply, kHoundDiagErrorServiceNotReady);
    return true;
  }
  if (const auto reason = admit(order)) {
    refuse(request.reply, *reason);
    return true;
  }
  const std::string identifier = order.identifier;
  open_.emplace(identifier, std::move(order));
  const std::chrono::duration<double> duration(request.duration_seconds);
  dependencies_.reporting_queue.postAfter(std::chrono::duration_cast<std::chrono::nanoseconds>(duration),
                                          life_.guard([this, identifier] { timeIsOver(identifier); }));
  // At once: who asked may be stopped in the very task that is running, and must
  // know by then what to cancel.
  if (request.reply) {
    request.reply(MessageDict{{kHoundDiagReplySuccess, true}, {kHoundDiagReplySessionID, identifier}});
  }
  return true;
}

void CaptureService::cancelSession(std::string_view identifier) {
  assertOnQueue(dependencies_.reporting_queue);
  const auto found = open_.find(identifier);
  if (found == open_.end()) {
    TAL_LOG_INFO(dependencies_.log, "no open capture is called ", identifier,
                 ". reason=kHoundDiagErrorSessionNotFound");
    return;
  }
  // What was never taken does not use up a limit.
  throttle_.takeBack(found->second.signature.text());
  keepThrottle();
  open_.erase(found);
  TAL_LOG_INFO(dependencies_.log, "cancelled capture ", identifier);
}

void CaptureService::timeIsOver(const std::string& identifier) {
  const auto found = open_.find(identifier);
  if (found == open_.end()) return;
  CaptureOrder order = std::move(found->second);
  open_.erase(found);
  // The writer logs how it went; nobody else asks any more.
  const auto payload = order.payload;
  write(std::move(order), payload, [](std::error_code) {});
}

void CaptureService::requestFlutter(FlutterRequest request) {
  assertOnQueue(dependencies_.reporting_queue);
  CaptureOrder order{.kind = request.type,
                     .signature = {{kDomain, request.domain},
                                   {kType, request.type},
                                   {kDetectedProcess, request.description},
                                   {"flags", MessageArray(request.flags.begin(), request.flags.end())}},
                     .payload = std::move(request.payload),
                     .with_scheduler = true};
  if (const auto reason = admit(order)) {
    TAL_LOG_INFO(dependencies_.log, "no capture of kind ", order.kind,
                 ". reason=", kHoundDiagErrorNames[static_cast<std::size_t>(*reason)]);
    return;
  }
  // The payload is a client's message: which processes to look at is not its choice.
  write(std::move(order), std::nullopt, [](std::error_code) {});
}

std::optional<HoundDiagError> CaptureService::admit(CaptureOrder& order) {
  if (being_written_ >= kMostBeingWritten) return kHoundDiagErrorServiceNotReady;
  const double now = dependencies_.clock.secondsSince1970();
  const std::string signature = order.signature.text();
  const auto limit = readCaptureSettings(dependencies_.settings, dependencies_.log).daily_limit;
  if (const auto reason = throttle_.refusal(signature, now, limit)) return reason;
  throttle_.record(signature, now);
  keepThrottle();
  order.identifier = makeIdentifier(order.signature, now);
  order.requested_at = now;
  return std::nullopt;
}

std::string CaptureService::makeIdentifier(const MessageDict& signature, double now) {
  std::string words(textUnder(signature, kType));
  for (const MessageKey& key : {kSubtypeContext, kDetectedProcess}) {
    const std::string_view word = textUnder(signature, key);
    if (word.empty() || word == "Unknown") continue;
    words += '-';
    words += word;
  }
  const std::string time = timeInName(now);
  if (!names_of_second_.empty() && !names_of_second_.begin()->starts_with(time)) names_of_second_.clear();
  const std::string name = time + '-' + safeInFileName(words);
  std::string unique = name;
  for (int i = 2; !names_of_second_.insert(unique).second; ++i) unique = name + '-' + std::to_string(i);
  return unique;
}

void CaptureService::write(CaptureOrder order, const std::optional<MessageDict>& names_processes,
                           Written written) {
  ++being_written_;
  order.process_identifiers = processesToLookAt(names_processes);
  // The outcome comes back to the queue that the request came from, and only if the
  // service is still there; until then the work refers to the writer alone.
  const auto outcome = std::make_shared<std::error_code>();
  std::function<void()> back = life_.guard([this, outcome, written = std::move(written)] {
    --being_written_;
    written(*outcome);
  });
  dependencies_.work_queue.post([writer = dependencies_.writer, order = std::move(order), outcome,
                                 back = std::move(back), &queue = dependencies_.reporting_queue] {
    *outcome = writer->write(order);
    queue.post(back);
  });
}

std::vector<std::int32_t> CaptureService::processesToLookAt(const std::optional<MessageDict>& payload) const {
  const auto under = [](const MessageDict* dict, const MessageKey& key) {
    return dict ? dict->find(key) : nullptr;
  };
  const auto dictOf = [](const MessageValue* value) { return value ? value->dict() : nullptr; };
  const MessageValue* parameters = under(payload ? &*payload : nullptr, kHoundDiagKeyPayloadPKParameters);
  const MessageValue* filter = under(dictOf(parameters), kPKSysLogFilterProcess);
  const MessageValue* named = under(dictOf(filter), kProcessIDs);
  std::vector<std::int32_t> processes;
  if (named && named->array()) {
    for (const MessageValue& each : *named->array()) {
      processes.push_back(static_cast<std::int32_t>(each.toInt64()));
    }
  } else {
    processes = dependencies_.client_processes();
    processes.insert(processes.begin(), dependencies_.processes.ownProcessIdentifier());
  }
  std::sort(processes.begin(), processes.end());
  processes.erase(std::unique(processes.begin(), processes.end()), processes.end());
  return processes;
}

void CaptureService::keepThrottle() {
  dependencies_.work_queue.post(
      [writer = dependencies_.writer, text = throttle_.text()] { writer->keepThrottle(text); });
}

void CaptureService::answer(const Reply& reply, MessageDict response) {
  if (!reply) return;
  dependencies_.reporting_queue.post(
      [reply, response = std::move(response)] { reply(std::optional(response)); });
}

void CaptureService::refuse(const Reply& reply, HoundDiagError reason) {
  answer(reply, {{kHoundDiagReplySuccess, false}, {kHoundDiagReplyReason, std::int32_t{reason}}});
}

}  // namespace tal
