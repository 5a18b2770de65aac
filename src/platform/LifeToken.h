#pragma once

#include <memory>
#include <utility>

namespace tal {

/// Work posted to oneself dies with oneself: keep a LifeToken as the last member
/// and post `token.guard(task)`. The task then runs only while the token lives.
/// Token and guarded tasks belong to one queue.
class LifeToken {
 public:
  LifeToken() : alive_(std::make_shared<char>()) {}
  LifeToken(const LifeToken&) = delete;
  LifeToken& operator=(const LifeToken&) = delete;

  template <typename Task>
  auto guard(Task task) const {
    return [alive = std::weak_ptr<char>(alive_), task = std::move(task)]() mutable {
      if (!alive.expired()) task();
    };
  }

 private:
  std::shared_ptr<char> alive_;
};

}  // namespace tal
