#pragma once

#include <cstdint>
#include <string>

#include "core/Log.h"
#include "platform/CallstatBackend.h"
#include "platform/Clock.h"
#include "platform/linux/callstat/CallstatSettings.h"
#include "platform/linux/callstat/OutboxPublishers.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// A session as rows of the store: one for itself, before its first message, and
/// one for each message. Which back-ends it has is settled at its start.
class LinuxCallstatSession final : public CallstatSession {
 public:
  struct Dependencies {
    StoreWriter& store;
    CallstatSettingsReader& settings;
    OutboxPublishers& publishers;
    const Clock& clock;
    const LogChannel& log;
  };

  /// `row` names the session in the store. What is referred to outlives the object.
  LinuxCallstatSession(Dependencies dependencies, std::int64_t row, MessageDict session_info,
                       MessageDict user_info);
  LinuxCallstatSession(const LinuxCallstatSession&) = delete;
  LinuxCallstatSession& operator=(const LinuxCallstatSession&) = delete;
  ~LinuxCallstatSession() override;

  void startConfigurationWithCompletionHandler(CompletionHandler handler) override;
  Error sendMessage(std::uint16_t category, std::uint16_t type, const MessageDict& payload) override;
  void flushMessages() override;
  std::string description() const override;

 private:
  void announce();
  void appendPayload(const MessageDict& payload);
  void append(StoreTable table, std::uint16_t category, std::uint16_t type);

  Dependencies dependencies_;
  std::int64_t row_;
  MessageDict session_info_;
  MessageDict user_info_;
  bool is_realtime_ = false;
  bool announced_ = false;
  bool to_store_ = false;
  bool to_brokers_ = false;
  std::string payload_;  // kept for its memory
};

}  // namespace tal
