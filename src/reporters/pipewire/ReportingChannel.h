// The one way out of the reporter: everything that decides speaks to this interface, so that
// it is tested without a daemon.
#pragma once

#include <cstdint>
#include <string>

#include "reporters/pipewire/ReportMessage.h"

namespace tal {

/// What a reporting session is opened with; it stays the same for the session's life.
struct ReportedStream {
  ReportServiceType serviceType = ReportServiceType::kNonLongFormAudio;
  /// Empty when nothing tells who the application is.
  std::string applicationName;

  bool operator==(const ReportedStream&) const = default;
};

/// Carries reporting sessions to the daemon.
///
/// Called on the main loop's thread. No operation blocks or fails: what the daemon cannot take
/// now is kept or counted by the implementation.
class ReportingChannel {
 public:
  virtual ~ReportingChannel() = default;

  /// Opens and starts a reporting session; returns the reporter ID that names it from here on.
  virtual std::int64_t openSession(const ReportedStream& stream) = 0;
  virtual void sendMessage(std::int64_t reporterID, const ReportMessage& message) = 0;
  /// Stops and destroys the session, after everything that was sent to it before.
  virtual void closeSession(std::int64_t reporterID) = 0;
};

}  // namespace tal
