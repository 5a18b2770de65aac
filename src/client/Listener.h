// Calls the functions that a program gave, unless it has asked to hear nothing more.
#pragma once

#include <string>

#include "client/talreporting.h"

namespace tal::clientlib {

/// Lives on the library's thread.
class Listener {
 public:
  explicit Listener(const tal_callbacks& callbacks) : callbacks_(callbacks) {}

  /// A program that closes its connection in a callback has often freed what the others would use.
  void mute() { callbacks_ = {}; }

  void connected(const std::string& server) {
    lastTrouble_.clear();
    if (callbacks_.connected) callbacks_.connected(callbacks_.user, server.c_str());
  }
  void disconnected(const tal_error& why) const {
    if (callbacks_.disconnected) callbacks_.disconnected(callbacks_.user, &why);
  }
  bool wantsReplies() const { return callbacks_.reply != nullptr; }
  void reply(const tal_reply& reply) const {
    if (callbacks_.reply) callbacks_.reply(callbacks_.user, &reply);
  }
  void error(const tal_error& error) const {
    if (callbacks_.error) callbacks_.error(callbacks_.user, &error);
  }
  /// Tells of a failed attempt to connect, once as long as it is the same.
  void trouble(const tal_error& why) {
    const std::string trouble = std::string(why.domain) + std::to_string(why.code) + why.message;
    if (lastTrouble_ == trouble) return;
    lastTrouble_ = trouble;
    error(why);
  }

 private:
  tal_callbacks callbacks_;
  std::string lastTrouble_;
};

}  // namespace tal::clientlib
