#include "platform/linux/callstat/MqttConnection.h"

#include <mosquitto.h>

#include <cerrno>
#include <cstring>
#include <utility>

namespace tal {

namespace {

constexpr int kKeepAliveSeconds = 120;
constexpr int kQualityOfService = 1;
constexpr int kMostPackets = 64;
// Unconfirmed publications; what is beyond waits here as well as there.
constexpr unsigned kMostInFlight = 1024;
constexpr const char* kHostCertificates = "/etc/ssl/certs";

MqttConnection& self(void* object) { return *static_cast<MqttConnection*>(object); }

}  // namespace

MqttConnection::MqttConnection(const Options& options, Confirmed confirmed)
    : options_(options),
      confirmed_(std::move(confirmed)),
      handle_(mosquitto_new(options.client_id.c_str(), /*clean_session=*/true, this)) {
  if (!handle_) return;
  mosquitto_max_inflight_messages_set(handle_, kMostInFlight);
  mosquitto_connect_callback_set(handle_,
                                 [](mosquitto*, void* object, int code) { self(object).accepted(code); });
  mosquitto_publish_callback_set(
      handle_, [](mosquitto*, void* object, int identifier) { self(object).confirmed_(identifier); });
  mosquitto_log_callback_set(handle_, [](mosquitto*, void* object, int level, const char* text) {
    if (level == MOSQ_LOG_ERR) self(object).last_complaint_ = text;
  });
}

MqttConnection::~MqttConnection() {
  if (up_) mosquitto_disconnect(handle_);
  mosquitto_destroy(handle_);
}

MqttConnection::Error MqttConnection::open() {
  if (!handle_) return "out of memory";
  if (!options_.username.empty()) {
    const int code = mosquitto_username_pw_set(handle_, options_.username.c_str(), options_.password.c_str());
    if (code != MOSQ_ERR_SUCCESS) return errorOf(code);
  }
  if (options_.tls) {
    const bool own = !options_.ca_file.empty();
    const int code = mosquitto_tls_set(handle_, own ? options_.ca_file.c_str() : nullptr,
                                       own ? nullptr : kHostCertificates, nullptr, nullptr, nullptr);
    if (code != MOSQ_ERR_SUCCESS) return "the certificates in ca_file cannot be used";
  }
  return errorOf(mosquitto_connect_async(handle_, options_.host.c_str(), options_.port, kKeepAliveSeconds));
}

void MqttConnection::accepted(int code) {
  up_ = code == 0;
  if (!up_) refusal_ = mosquitto_connack_string(code);
}

MqttConnection::Error MqttConnection::errorOf(int code) const {
  if (!refusal_.empty()) return refusal_;
  if (code == MOSQ_ERR_SUCCESS || code == MOSQ_ERR_CONN_PENDING) return std::nullopt;
  std::string reason = code == MOSQ_ERR_ERRNO ? std::strerror(errno) : mosquitto_strerror(code);
  if (!last_complaint_.empty()) reason += " (" + last_complaint_ + ')';
  return reason;
}

int MqttConnection::socket() const { return mosquitto_socket(handle_); }

// Before the connection stands, the library does not say that it waits for that.
bool MqttConnection::wantsToWrite() const { return !reached_ || mosquitto_want_write(handle_); }

MqttConnection::Error MqttConnection::serve(bool readable, bool writable) {
  int code = MOSQ_ERR_SUCCESS;
  const bool newly_reached = writable && !std::exchange(reached_, true);
  if (readable || newly_reached) code = mosquitto_loop_read(handle_, kMostPackets);
  if (code == MOSQ_ERR_SUCCESS && writable) code = mosquitto_loop_write(handle_, kMostPackets);
  if (code == MOSQ_ERR_SUCCESS) code = mosquitto_loop_misc(handle_);
  if (code == MOSQ_ERR_SUCCESS && socket() < 0) code = MOSQ_ERR_CONN_LOST;
  return errorOf(code);
}

MqttConnection::Error MqttConnection::publish(const std::string& topic, const std::string& payload,
                                              int& identifier) {
  return errorOf(mosquitto_publish(handle_, &identifier, topic.c_str(), static_cast<int>(payload.size()),
                                   payload.data(), kQualityOfService, /*retain=*/false));
}

}  // namespace tal
