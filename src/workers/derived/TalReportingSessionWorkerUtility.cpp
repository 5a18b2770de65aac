#include "workers/derived/TalReportingSessionWorkerUtility.h"

#include <cstdint>

namespace tal {

namespace {

constexpr std::size_t kNoKey = static_cast<std::size_t>(-1);

// Keys are few: the caller names two.
std::size_t combiningKey(const MessageDict& message, std::span<const MessageKey> keys) {
  for (std::size_t i = 0; i < keys.size(); ++i) {
    if (message.contains(keys[i])) return i;
  }
  return kNoKey;
}

}  // namespace

TalReportingSessionWorkerUtility::Messages TalReportingSessionWorkerUtility::combineRapidMessages(
    const Messages& messages, std::span<const MessageKey> keys, double maximum_pause_seconds) {
  Messages result;
  result.reserve(messages.size());
  std::vector<bool> used(keys.size(), false);
  TalReportingSessionMessage* head = nullptr;

  for (const auto& message : messages) {
    const std::size_t key = combiningKey(message->message(), keys);
    if (key == kNoKey) {
      result.push_back(message);
      continue;
    }
    if (used[key]) {
      used.assign(keys.size(), false);
      head = nullptr;
    }
    used[key] = true;
    if (!head) {
      head = message.get();
      result.push_back(message);
    } else if (message->epochTime() - head->epochTime() < maximum_pause_seconds) {
      // The head takes over the time stamp too: the next pause counts from here.
      head->mutableMessage().merge(message->message());
    } else {
      result.push_back(message);
    }
  }
  return result;
}

bool TalReportingSessionWorkerUtility::isParleyXYerrorMessage(const TalReportingSessionMessage& message) {
  for (const auto& [key, value] : message.message()) {
    if (key.starts_with("vmox_invalid_")) return true;
  }
  return false;
}

}  // namespace tal
