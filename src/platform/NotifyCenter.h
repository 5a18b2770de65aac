#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>

#include "platform/SerialQueue.h"

namespace tal {

/// How an operation on notifications went; 0 is success.
enum class NotifyStatus : std::uint32_t {
  kOk = 0,
  kInvalidName = 1,   ///< empty, or one that cannot name a notification
  kInvalidToken = 2,  ///< never given out, or cancelled
  kFailed = 3,        ///< the host refused; the reason is logged
};

/// Notifications between programs: a name that anyone may post and watch, and a
/// 64-bit state kept with it. Any thread, unless a method says otherwise.
///
/// Every watcher is told of every post, by whatever program, in order; a state
/// is read as it is by then, so a handler that is late sees the latest only.
class NotifyCenter {
 public:
  /// Names a registration: 1 or more.
  using Token = std::int32_t;
  using Handler = std::function<void(Token)>;
  static constexpr Token kNoToken = -1;

  struct Registration {
    NotifyStatus status = NotifyStatus::kFailed;
    Token token = kNoToken;
  };
  struct State {
    NotifyStatus status = NotifyStatus::kFailed;
    std::uint64_t value = 0;
  };

  virtual ~NotifyCenter() = default;

  /// Calls `handler` on `queue` once for every post of the name from now on.
  /// The queue lives until the registration is cancelled or the centre is gone.
  virtual Registration registerDispatch(std::string_view name, SerialQueue& queue, Handler handler) = 0;

  /// The state of the notification that the token watches; 0 before any was posted.
  virtual State getState(Token token) = 0;

  /// Ends a registration. On its queue, its handler is not called any more once
  /// this returns; on another thread a call that has begun may still be running.
  virtual NotifyStatus cancel(Token token) = 0;

  /// Posts the notification; without a state the one it has stays.
  virtual NotifyStatus post(std::string_view name, std::optional<std::uint64_t> state) = 0;
};

}  // namespace tal
