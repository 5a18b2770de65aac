#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageDict.h"

namespace tal {

// The back-end's own names for what a session tells of itself.
inline constexpr MessageKey kCallstatClientType{"client_type"};
inline constexpr MessageKey kCallstatClientVersion{"client_version"};
inline constexpr MessageKey kCallstatSessionIdentifier{"session_identifier"};
inline constexpr MessageKey kCallstatBatchEvents{"batch_events"};
inline constexpr MessageKey kCallstatHierarchyToken{"hierarchy_token"};
inline constexpr MessageKey kCallstatContainsRealTimeEvents{"contains_real_time_events"};
inline constexpr MessageKey kCallstatClientBundleIdentifier{"client_bundle_identifier"};
// And of its user.
inline constexpr MessageKey kCallstatClientName{"client_name"};
inline constexpr MessageKey kCallstatServiceName{"service_name"};

/// The key that marks a session's summary, whose values can be long.
inline constexpr MessageKey TalReportingRtcSummaryEvent{"TAL_Session_Summary_Event"};

/// Names a session in the back-end's hierarchy. Opaque to everyone else.
struct CallstatToken {
  std::string text;
};

/// One open session of the back-end. Called on one queue; a call may wait for the
/// disk. Nothing that was sent is taken back when the session ends.
class CallstatSession {
 public:
  /// Told of the upload back-ends that were found, by name.
  using CompletionHandler = std::function<void(const std::vector<std::string>& backends)>;
  /// The reason, in words; nothing on success.
  using Error = std::optional<std::string>;

  virtual ~CallstatSession() = default;

  /// Begins to look for upload back-ends. The handler is called once, on any
  /// thread, possibly before this returns and possibly never.
  virtual void startConfigurationWithCompletionHandler(CompletionHandler handler) = 0;

  virtual Error sendMessage(std::uint16_t category, std::uint16_t type, const MessageDict& payload) = 0;

  /// Sends what waits in the session's batch.
  virtual void flushMessages() = 0;

  /// How log lines name the session.
  virtual std::string description() const = 0;
};

/// The statistics of real-time communication: where sessions' messages go, in
/// batches or one by one, on their way to a server. Any thread but the reporting
/// queue, since opening a session may take long.
class CallstatBackend {
 public:
  virtual ~CallstatBackend() = default;

  /// A token below the parent, or a root token without one; nothing on failure.
  virtual std::optional<CallstatToken> newHierarchyTokenFromParentToken(const CallstatToken* parent) = 0;

  /// The dictionaries have the keys above. `frameworks_to_check` empty: all. The
  /// back-end outlives the session.
  virtual std::unique_ptr<CallstatSession> initWithSessionInfo(
      MessageDict session_info, MessageDict user_info,
      const std::vector<std::string>& frameworks_to_check) = 0;
};

}  // namespace tal
