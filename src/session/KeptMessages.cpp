#include "session/KeptMessages.h"

namespace tal {

namespace {

// The record with its count, and its place in the list.
constexpr std::size_t kRecordBytes = sizeof(TalReportingSessionMessage) + 4 * sizeof(void*);

}  // namespace

void KeptMessages::append(TalReportingSessionMessage::Pointer message) {
  const std::size_t bytes = kRecordBytes + message->message().footprintBytes();
  bytes_ += bytes;
  owner_bytes_ += bytes;
  last_of_kind_[kindOf(message->category(), message->type())] = message.get();
  messages_.push_back(std::move(message));
}

const TalReportingSessionMessage* KeptMessages::lastOfKind(AudioEventCategory category,
                                                           AudioEventType type) const {
  const auto found = last_of_kind_.find(kindOf(category, type));
  return found == last_of_kind_.end() ? nullptr : found->second;
}

void KeptMessages::sort() {
  TalReportingSessionMessage::sortMessages(messages_);
  last_of_kind_.clear();
  for (const auto& message : messages_)
    last_of_kind_[kindOf(message->category(), message->type())] = message.get();
}

void KeptMessages::clear() {
  owner_bytes_ -= bytes_;
  bytes_ = 0;
  last_of_kind_.clear();
  // Gives the list's own memory back too: a session may live on for days.
  std::vector<TalReportingSessionMessage::Pointer>().swap(messages_);
}

}  // namespace tal
