// What the reporter says to the daemon about one stream, in the shape in which it is decided
// and tested: no wire format, no client library.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <variant>
#include <vector>

namespace tal {

/// The event categories that this reporter uses, by their number in the event vocabulary.
enum class ReportCategory : std::uint32_t {
  kRecord = 2,
  kPlayback = 4,
  kIo = 7,
  kRouteChange = 10,
  kVolume = 14,
};

/// The event types that this reporter uses, by their number in the event vocabulary.
enum class ReportType : std::uint16_t {
  kGeneric = 0,
  kStart = 1,
  kStop = 2,
  kError = 6,
};

/// The service types that this reporter gives its sessions, by their number in the event vocabulary.
enum class ReportServiceType : std::uint16_t {
  kTelephony = 2,
  kAlarms = 4,
  kLongFormAudio = 7,
  kNonLongFormAudio = 8,
  kSystemSounds = 13,
};

using ReportValue = std::variant<bool, std::int64_t, double, std::string>;
using ReportFields = std::vector<std::pair<std::string, ReportValue>>;

/// One message of a reporting session.
struct ReportMessage {
  ReportCategory category;
  ReportType type;
  ReportFields fields;

  bool operator==(const ReportMessage&) const = default;
};

}  // namespace tal
