#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "platform/NotifyCenter.h"

namespace tal::test {

/// Notifications within one test. A post puts the handlers on their queues
/// before it returns.
class FakeNotifyCenter final : public NotifyCenter {
 public:
  struct Watcher {
    std::string name;
    SerialQueue& queue;
    Handler handler;
  };

  Registration registerDispatch(std::string_view name, SerialQueue& queue, Handler handler) override {
    if (!isName(name)) return {NotifyStatus::kInvalidName, kNoToken};
    if (registrations_fail) return {NotifyStatus::kFailed, kNoToken};
    ++last_token_;
    watchers[last_token_] = std::make_shared<Watcher>(Watcher{std::string(name), queue, std::move(handler)});
    return {NotifyStatus::kOk, last_token_};
  }
  State getState(Token token) override {
    const auto found = watchers.find(token);
    if (found == watchers.end()) return {NotifyStatus::kInvalidToken, 0};
    if (states_fail) return {NotifyStatus::kFailed, 0};
    return {NotifyStatus::kOk, states[found->second->name]};
  }
  NotifyStatus cancel(Token token) override {
    return watchers.erase(token) == 1 ? NotifyStatus::kOk : NotifyStatus::kInvalidToken;
  }
  NotifyStatus post(std::string_view name, std::optional<std::uint64_t> state) override {
    if (!isName(name)) return NotifyStatus::kInvalidName;
    if (state) states[std::string(name)] = *state;
    for (const auto& [token, watcher] : watchers) {
      if (watcher->name != name) continue;
      watcher->queue.post([weak = std::weak_ptr<Watcher>(watcher), token = token] {
        if (const auto held = weak.lock()) held->handler(token);
      });
    }
    return NotifyStatus::kOk;
  }

  bool registrations_fail = false;
  bool states_fail = false;
  std::map<Token, std::shared_ptr<Watcher>> watchers;
  std::map<std::string, std::uint64_t> states;

 private:
  static bool isName(std::string_view name) {
    return !name.empty() && name.front() != '.' && name.find('/') == std::string_view::npos;
  }

  Token last_token_ = 0;
};

}  // namespace tal::test
