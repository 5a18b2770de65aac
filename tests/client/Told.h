// What the library told a program through its callbacks, to wait for.
#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <vector>

#include "client/talreporting.hpp"

namespace tal::test {

/// Lines such as "connected fake 1", "reply 6 of 7 tag 3", "reply 6 of 7 refused 1", "error 4". From any
/// thread.
class Told {
 public:
  void add(std::string line) {
    const std::lock_guard lock(mutex_);
    lines_.push_back(std::move(line));
    changed_.notify_all();
  }

  /// The lines as soon as there are `count` of them; fewer after ten seconds.
  std::vector<std::string> lines(std::size_t count) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, std::chrono::seconds(10), [&] { return lines_.size() >= count; });
    return lines_;
  }

  void hear(client::Options& options) {
    options.onConnected = [this](std::string_view server) { add("connected " + std::string(server)); };
    options.onDisconnected = [this](const tal_error& why) {
      add(std::string("disconnected: ") + why.message);
    };
    options.onReply = [this](const tal_reply& reply) { add(describe(reply)); };
    options.onError = [this](const tal_error& error) { add("error " + std::to_string(error.code)); };
  }

  static std::string describe(const tal_reply& reply) {
    std::string text =
        "reply " + std::to_string(reply.operation) + " of " + std::to_string(reply.reporter_id);
    if (reply.tag != 0) text += " tag " + std::to_string(reply.tag);
    if (reply.error) return text + " refused " + std::to_string(reply.error->code);
    return text;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::string> lines_;
};

}  // namespace tal::test
