#include "tools/talctl/NotifyCommand.h"

#include <charconv>
#include <cstdint>

#include "platform/linux/notify/NotifyFiles.h"
#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

std::uint64_t parseState(const std::string& text) {
  std::uint64_t state = 0;
  const char* const end = text.data() + text.size();
  const auto [parsed_to, error] = std::from_chars(text.data(), end, state);
  if (error != std::errc() || parsed_to != end) {
    throw UsageError("'" + text + "' is no state: a decimal number of 64 bits without a sign");
  }
  return state;
}

}  // namespace

void runNotifyPost(const DaemonLocation& daemon, const std::string& name,
                   const std::optional<std::string>& state) {
  if (!isNotificationName(name)) {
    throw UsageError("'" + name +
                     "' is no name of a notification: 1 to 255 bytes without '/', no '.' in front");
  }
  std::optional<std::uint64_t> number;
  if (state) number = parseState(*state);
  if (const auto error = postNotification(daemon.notifyDirectory(), name, number)) {
    throw CommandFailure("cannot post " + name + ": " + error->reason);
  }
}

}  // namespace tal::talctl
