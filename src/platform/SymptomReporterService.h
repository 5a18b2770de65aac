#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"

namespace tal {

// The keys of a reply.
inline constexpr MessageKey kHoundDiagReplySuccess{"Success"};      ///< boolean
inline constexpr MessageKey kHoundDiagReplySessionID{"SessionID"};  ///< string: names the capture
inline constexpr MessageKey kHoundDiagReplyReason{"Reason"};        ///< integer, a HoundDiagError

/// The key of a payload under which the capture's parameters stand.
inline constexpr MessageKey kHoundDiagKeyPayloadPKParameters{"PKParameters"};
/// Of these parameters: a dictionary that names the processes to look at…
inline constexpr MessageKey kPKSysLogFilterProcess{"org.vantle.EnergylogCore.PKSysLogFilterProcess"};
/// …as an array of their identifiers.
inline constexpr MessageKey kProcessIDs{"processIDs"};

/// Why a capture was refused.
enum HoundDiagError : std::int32_t {
  kHoundDiagErrorNone = 0,
  kHoundDiagErrorServiceNotReady = 1,
  kHoundDiagErrorNotSupported = 2,
  kHoundDiagErrorServiceUnavailable = 3,
  kHoundDiagErrorServiceInterrupted = 4,
  kHoundDiagErrorInvalidParameters = 5,
  kHoundDiagErrorDailyLimitExceeded = 6,
  kHoundDiagErrorRandomizedSuppression = 7,
  kHoundDiagErrorSessionNotFound = 8,
  kHoundDiagErrorRequestThrottled = 9,
};

/// By HoundDiagError.
inline constexpr std::array<std::string_view, 10> kHoundDiagErrorNames{"kHoundDiagErrorNone",
                                                                       "kHoundDiagErrorServiceNotReady",
                                                                       "kHoundDiagErrorNotSupported",
                                                                       "kHoundDiagErrorServiceUnavailable",
                                                                       "kHoundDiagErrorServiceInterrupted",
                                                                       "kHoundDiagErrorInvalidParameters",
                                                                       "kHoundDiagErrorDailyLimitExceeded",
                                                                       "kHoundDiagErrorRandomizedSuppression",
                                                                       "kHoundDiagErrorSessionNotFound",
                                                                       "kHoundDiagErrorRequestThrottled"};

/// Takes captures of the whole device for engineers when a fault was seen.
///
/// One client object is made for each fault. Called on the reporting queue: no
/// operation may block it.
class SymptomReporterService {
 public:
  /// Names a kind of fault; opaque to all but the service. Limits are kept by it.
  using Signature = MessageDict;
  /// Called once, on the reporting queue, before the request returns or later; not
  /// at all when the host ends first.
  using Reply = std::function<void(const std::optional<MessageDict>& response)>;

  struct SignatureFields {
    std::string_view domain;
    std::string_view type;
    std::string_view sub_type;
    std::string_view subtype_context;
    std::string_view detected_process;
    std::optional<MessageDict> trigger_threshold_values = std::nullopt;
  };

  struct Request {
    Signature signature;
    double duration_seconds = 0;
    std::optional<MessageArray> events = std::nullopt;
    std::optional<MessageDict> payload = std::nullopt;
    std::optional<MessageArray> actions = std::nullopt;
    Reply reply;
  };

  virtual ~SymptomReporterService() = default;

  virtual Signature signatureWithDomain(const SignatureFields& fields) = 0;

  /// Takes a capture at once. False when the parameters make no sense; the reply
  /// comes all the same.
  virtual bool snapshotWithSignature(Request request) = 0;

  /// Opens a capture session, which captures when its duration is over unless it
  /// was cancelled. Answers as above.
  virtual bool startSessionWithSignature(Request request) = 0;

  /// Any text may be passed; one that names no open session does nothing.
  virtual void cancelSession(std::string_view identifier) = 0;
};

/// The reporting session in which a fault was seen, for the capture to tell of.
struct SymptomContext {
  struct Message {
    AudioEventCategory category;
    AudioEventType type;
    MessageDict message;
  };

  std::string session;                 ///< its description
  std::vector<Message> last_messages;  ///< the oldest first
};

/// Makes a client of the service for each fault. Lives as long as the process.
class SymptomReporterFactory {
 public:
  virtual ~SymptomReporterFactory() = default;
  virtual std::shared_ptr<SymptomReporterService> makeClient(SymptomContext context) = 0;
};

}  // namespace tal
