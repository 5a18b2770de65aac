// A connection to a fake daemon.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <optional>

#include "client/FakeDaemon.h"
#include "client/Told.h"
#include "client/talreporting.hpp"

namespace tal::test {

/// Only what fails takes that long.
constexpr std::chrono::seconds kPatience{10};
constexpr std::uint32_t kPatienceMs = 10000;

class ConnectionFixture : public testing::Test {
 protected:
  /// Options that reach the daemon, hear everything, and reconnect at once.
  client::Options options() {
    client::Options options;
    options.socketPath = daemon_.path();
    options.reconnectMin = options.reconnectMax = std::chrono::milliseconds(1);
    told_.hear(options);
    return options;
  }

  tal_connection* open(client::Options chosen) { return connection_.emplace(std::move(chosen)).get(); }

  /// Listens, connects and answers the hello.
  tal_connection* openAndWelcome() {
    daemon_.listen();
    tal_connection* handle = open(options());
    peer_ = daemon_.welcome();
    return handle;
  }

  /// A message with the one entry "n".
  static client::Message numbered(int n) { return client::Message{{"n", n}}; }
  tal_status sendNumbered(std::int64_t reporter, int n) {
    return connection_->send(numbered(n), TAL_CATEGORY_VOLUME, TAL_TYPE_GENERIC, {reporter},
                             static_cast<std::uint64_t>(n));
  }
  static std::string numberedText(std::int64_t reporter, int n) {
    return "6({\"n\": " + std::to_string(n) + "}, 14, 0, [" + std::to_string(reporter) + "])";
  }

  FakeDaemon daemon_;
  Told told_;
  std::optional<client::Connection> connection_;
  std::unique_ptr<FakePeer> peer_;
};

}  // namespace tal::test
