#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/linux/callstat/CallstatSettings.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

/// Those who take messages from the outbox to the brokers, one for each. Any thread.
class OutboxPublishers {
 public:
  struct Dependencies {
    StoreWriter& store;
    std::filesystem::path store_path;
    CallstatSettingsReader& settings;
    const Clock& clock;
    const LogChannel& log;
  };

  virtual ~OutboxPublishers() = default;

  /// Serves these brokers from now on, and no others; an empty list changes
  /// nothing for what waits in the outbox. The brokers whose messages will go
  /// out some day, by their URIs.
  virtual std::vector<std::string> serve(const std::vector<BrokerAddress>& brokers) = 0;

  /// A message was appended to the outbox.
  virtual void messageWaits() = 0;

  /// The messages of the session, a row of the store, need not wait for more.
  virtual void flush(std::int64_t session) = 0;

  /// Ends what is under way; what was not confirmed stays in the outbox.
  virtual void stop() = 0;
};

/// In a build without libmosquitto they serve nobody, and say so when asked to.
std::unique_ptr<OutboxPublishers> makeOutboxPublishers(OutboxPublishers::Dependencies dependencies);

}  // namespace tal
