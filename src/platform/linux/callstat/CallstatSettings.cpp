#include "platform/linux/callstat/CallstatSettings.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>

namespace tal {

namespace {

constexpr std::string_view kDomain = "org.vantle.talsys.rtc";
constexpr std::string_view kDefaultTopic = "talreporting";
constexpr int kPlainPort = 1883;
constexpr int kTlsPort = 8883;
constexpr int kMostPort = 65535;

bool takePrefix(std::string_view& text, std::string_view prefix) {
  if (text.substr(0, prefix.size()) != prefix) return false;
  text.remove_prefix(prefix.size());
  return true;
}

// These mean something in a topic.
std::string fitForTopic(std::string name) {
  std::replace_if(
      name.begin(), name.end(), [](char c) { return c == '/' || c == '+' || c == '#' || c == '\0'; }, '_');
  return name;
}

}  // namespace

std::optional<BrokerAddress> parseBrokerAddress(std::string_view uri) {
  BrokerAddress address{.uri = std::string(uri), .host = {}, .port = kPlainPort, .tls = false};
  if (takePrefix(uri, "mqtts://")) {
    address.tls = true;
    address.port = kTlsPort;
  } else if (!takePrefix(uri, "mqtt://")) {
    return std::nullopt;
  }
  if (!uri.empty() && uri.back() == '/') uri.remove_suffix(1);
  std::string_view port;
  if (takePrefix(uri, "[")) {  // an IPv6 address
    const auto end = uri.find(']');
    if (end == std::string_view::npos) return std::nullopt;
    address.host = uri.substr(0, end);
    port = uri.substr(end + 1);
  } else {
    const auto end = std::min(uri.find(':'), uri.size());
    address.host = uri.substr(0, end);
    port = uri.substr(end);
  }
  if (address.host.empty() || address.host.find_first_of("/@ ") != std::string::npos) return std::nullopt;
  if (port.empty()) return address;
  if (!takePrefix(port, ":")) return std::nullopt;
  const auto parsed = std::from_chars(port.data(), port.data() + port.size(), address.port);
  const bool is_whole = parsed.ec == std::errc() && parsed.ptr == port.data() + port.size();
  if (!is_whole || address.port < 1 || address.port > kMostPort) return std::nullopt;
  return address;
}

CallstatSettings CallstatSettingsReader::read() {
  CallstatSettings result;
  std::string wrong;
  result.store = flag("store", wrong);
  result.brokers = brokers(wrong);
  result.topic = text("topic", wrong);
  if (result.topic.empty()) result.topic = kDefaultTopic;
  if (result.topic.find_first_of("+#") != std::string::npos) {
    wrong += " topic";
    result.topic = kDefaultTopic;
  }
  result.device = device();
  result.username = text("username", wrong);
  result.password_file = text("password_file", wrong);
  result.ca_file = text("ca_file", wrong);
  const std::lock_guard lock(mutex_);
  if (wrong != complained_about_ && !wrong.empty()) {
    TAL_LOG_ERROR(log_, "settings ", kDomain, ":", wrong, " not usable, as if absent");
  }
  complained_about_ = wrong;
  return result;
}

bool CallstatSettingsReader::flag(std::string_view key, std::string& wrong) const {
  const auto value = settings_.value(kDomain, key);
  if (!value) return false;
  if (value->kind() == MessageValue::Kind::kBoolean) return value->toBool();
  wrong += ' ';
  wrong += key;
  return false;
}

std::string CallstatSettingsReader::text(std::string_view key, std::string& wrong) const {
  const auto value = settings_.value(kDomain, key);
  if (!value) return {};
  if (value->isString()) return std::string(value->string());
  wrong += ' ';
  wrong += key;
  return {};
}

std::vector<BrokerAddress> CallstatSettingsReader::brokers(std::string& wrong) const {
  std::vector<BrokerAddress> result;
  const auto value = settings_.value(kDomain, "brokers");
  if (!value) return result;
  const MessageArray* const list = value->array();
  if (!list) wrong += " brokers";
  for (const MessageValue& item : list ? *list : MessageArray()) {
    const auto address = parseBrokerAddress(item.string());
    if (!address) {
      wrong += " broker \"" + item.text() + '"';
    } else if (std::find(result.begin(), result.end(), *address) == result.end()) {
      result.push_back(*address);
    }
  }
  return result;
}

std::string CallstatSettingsReader::device() const {
  const auto name = settings_.value("org.vantle.talsys", "device_name");
  if (name && !name->string().empty()) return fitForTopic(std::string(name->string()));
  std::array<char, 256> host{};
  if (::gethostname(host.data(), host.size() - 1) != 0 || host[0] == '\0') return "unknown";
  return fitForTopic(host.data());
}

}  // namespace tal
