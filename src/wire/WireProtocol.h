#pragma once

// The numbers and names that both ends of a connection agree on.

#include <cstdint>
#include <string_view>

namespace tal {

inline constexpr std::uint64_t kProtocolVersion = 1;

enum class Operation : std::uint8_t {
  kHello = 0,
  kCreateReportingSession = 1,
  kSetServiceType = 2,
  kGetServiceNameForReporterID = 3,
  kSetConfiguration = 4,
  kStartReportingSessionForID = 5,
  kSendMessage = 6,
  kStopReportingSessionForID = 7,
  kDestroyReportingSession = 8,
  kValidateReporterID = 9,
  kGetAllReporters = 10,
  kKillService = 11,
};

/// The option of hello, and its one value with a meaning.
inline constexpr std::string_view kAcknowledgeOption = "acknowledge";
inline constexpr std::string_view kAcknowledgeDurable = "durable";

/// Errors of the protocol, of the domain "org.vantle.talsys.ipc".
enum class WireErrorCode : std::uint8_t {
  kBadRequest = 1,
  kUnknownOperation = 2,
  kNotPermitted = 3,
  kBadFrameLength = 4,
  kUnsupportedVersion = 5,
  kNotStored = 6,
  kKeepsTooMuch = 7,
};
inline constexpr std::string_view kWireErrorDomain = "org.vantle.talsys.ipc";

/// The one error of the service itself: reporting is disabled.
inline constexpr std::string_view kServiceErrorDomain = "org.vantle.audio.reporting";
inline constexpr std::uint64_t kServiceErrorReportingDisabled = 1;

}  // namespace tal
