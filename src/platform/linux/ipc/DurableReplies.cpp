#include "platform/linux/ipc/DurableReplies.h"

namespace tal {

void DurableReplies::rowsSettled(std::uint64_t up_to) {
  if (!listening_.load(std::memory_order_relaxed)) return;
  queue_.post([this, up_to] { settle(up_to); });
}

void DurableReplies::settle(std::uint64_t up_to) {
  std::erase_if(holders_, [up_to](const std::weak_ptr<DurableReplyHolder>& weak) {
    const auto holder = weak.lock();
    return !holder || !holder->rowsSettled(up_to);
  });
}

}  // namespace tal
