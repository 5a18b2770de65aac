#pragma once

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/Log.h"
#include "platform/CallstatBackend.h"
#include "platform/Clock.h"
#include "platform/SettingsStore.h"
#include "platform/linux/callstat/CallstatSettings.h"
#include "platform/linux/callstat/OutboxPublishers.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Real-time messages on Linux. Back-ends found are the store, where the setting
/// `store` of "org.vantle.talsys.rtc" is true: then messages stand in the view
/// `rtc_messages`. They are known at once, so a session is answered before
/// `startConfigurationWithCompletionHandler` returns. So is one outbox for each of
/// `brokers`, whatever the state of the connection: a broker that is away loses
/// nothing.
///
/// A message is durable once its row is committed.
class LinuxCallstatBackend final : public CallstatBackend {
 public:
  struct Dependencies {
    StoreWriter& store;
    std::filesystem::path store_path;
    const SettingsStore& settings;
    const Clock& clock;
    const LogChannel& log;
  };

  /// What is referred to outlives the object. Throws StartupError.
  explicit LinuxCallstatBackend(Dependencies dependencies);

  std::optional<CallstatToken> newHierarchyTokenFromParentToken(const CallstatToken* parent) override;
  std::unique_ptr<CallstatSession> initWithSessionInfo(
      MessageDict session_info, MessageDict user_info,
      const std::vector<std::string>& frameworks_to_check) override;

  /// Sends nothing more; before the store is closed.
  void stop() { publishers_->stop(); }

 private:
  Dependencies dependencies_;
  CallstatSettingsReader settings_reader_;
  std::unique_ptr<OutboxPublishers> publishers_;
  std::atomic<std::int64_t> last_session_;  // row of rtc_sessions
};

}  // namespace tal
