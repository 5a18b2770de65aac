#pragma once

#include <functional>
#include <optional>
#include <string>

struct mosquitto;

namespace tal {

/// One connection to a broker, MQTT 3.1.1, without a thread: its owner waits on
/// the socket and calls `serve`. One thread at a time.
class MqttConnection {
 public:
  struct Options {
    std::string host;
    int port = 0;
    bool tls = false;
    std::string ca_file;  ///< empty: the host's certificates
    std::string client_id;
    std::string username;
    std::string password;
  };
  /// The reason, in words; nothing on success.
  using Error = std::optional<std::string>;
  /// The broker has taken the publication of this identifier over.
  using Confirmed = std::function<void(int)>;

  MqttConnection(const Options& options, Confirmed confirmed);
  MqttConnection(const MqttConnection&) = delete;
  MqttConnection& operator=(const MqttConnection&) = delete;
  /// Ends the connection in order where it is up.
  ~MqttConnection();

  /// Begins to connect; only the look-up of the host's name may take long.
  Error open();

  int socket() const;
  bool wantsToWrite() const;
  /// Carries on after the socket became ready. After an error it is of no more use.
  Error serve(bool readable, bool writable);

  /// True once the broker has accepted.
  bool isUp() const { return up_; }

  /// Publishes with QoS 1; the identifier is told by `confirmed` later on.
  Error publish(const std::string& topic, const std::string& payload, int& identifier);

 private:
  void accepted(int code);
  Error errorOf(int code) const;

  Options options_;
  Confirmed confirmed_;
  mosquitto* handle_;
  bool up_ = false;
  bool reached_ = false;  // the socket was writable once
  std::string refusal_;
  std::string last_complaint_;  // of the library
};

}  // namespace tal
