#pragma once

#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/Log.h"
#include "platform/SettingsStore.h"

namespace tal {

/// Where a broker is: "mqtt://host:port" or "mqtts://host:port", the port 1883 or
/// 8883 where it is left out.
struct BrokerAddress {
  std::string uri;  ///< as the setting has it
  std::string host;
  int port = 0;
  bool tls = false;

  bool operator==(const BrokerAddress&) const = default;
};

/// Nothing for a text that is no such address.
std::optional<BrokerAddress> parseBrokerAddress(std::string_view uri);

/// What the settings domain "org.vantle.talsys.rtc" says of back-ends.
struct CallstatSettings {
  bool store = false;  ///< keep messages in `rtc_messages`
  std::vector<BrokerAddress> brokers;
  std::string topic;
  std::string device;  ///< `device_name` of "org.vantle.talsys", else the host's name, fit for a topic
  std::string username;
  std::string password_file;
  std::string ca_file;
};

/// Reads the settings again and again. A value that makes no sense is logged once,
/// and counts as absent. Any thread.
class CallstatSettingsReader {
 public:
  /// Both outlive the object.
  CallstatSettingsReader(const SettingsStore& settings, const LogChannel& log)
      : settings_(settings), log_(log) {}

  CallstatSettings read();

 private:
  bool flag(std::string_view key, std::string& wrong) const;
  std::string text(std::string_view key, std::string& wrong) const;
  std::vector<BrokerAddress> brokers(std::string& wrong) const;
  std::string device() const;

  const SettingsStore& settings_;
  const LogChannel& log_;
  std::mutex mutex_;
  std::string complained_about_;
};

}  // namespace tal
