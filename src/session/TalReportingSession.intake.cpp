// How a message enters a session: the part of TalReportingSession that runs for
// every single message. Named so that its log lines bear the name of the class.

#include "session/TalReportingSession.h"

#include <algorithm>
#include <array>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

// Differ between two messages that say the same.
constexpr std::array kTimeKeys{TalReportingInternalEventProcessUptimeMS,
                               TalReportingInternalEventSystemUptimeSec, TalReportingMessageKeyTalTimestamp};

constexpr double kOldestAcceptedSeconds = 365.0 * 24 * 60 * 60;

std::string_view yesOrNo(bool value) { return value ? "YES" : "NO"; }

bool hasBlank(std::string_view key) { return key.find(' ') != std::string_view::npos; }

std::string composedTag(AudioEventCategory category, AudioEventType type) {
  std::string tag = TalReportingUtilityCategoryString(category);
  tag += TalReportingUtilityTypeString(type);
  return tag;
}

// The tags of all named categories and types, which nearly every message bears.
class NamedTags {
 public:
  static constexpr std::size_t kCategories = static_cast<std::size_t>(AudioEventCategory::kEarlet) + 1;
  static constexpr std::size_t kTypes = static_cast<std::size_t>(AudioEventType::kMemoryLog) + 1;

  NamedTags() {
    for (std::size_t category = 0; category < kCategories; ++category) {
      for (std::size_t type = 0; type < kTypes; ++type) {
        tags_[category][type] =
            composedTag(static_cast<AudioEventCategory>(category), static_cast<AudioEventType>(type));
      }
    }
  }
  std::string_view at(std::size_t category, std::size_t type) const { return tags_[category][type]; }

 private:
  std::array<std::array<std::string, kTypes>, kCategories> tags_;
};

MessageValue audioTag(AudioEventCategory category, AudioEventType type) {
  static const NamedTags kNamed;
  const auto row = static_cast<std::size_t>(category);
  const auto column = static_cast<std::size_t>(type);
  if (row < NamedTags::kCategories && column < NamedTags::kTypes) {
    return MessageValue::literal(kNamed.at(row, column));
  }
  return composedTag(category, type);
}

}  // namespace

void TalReportingSession::sendMessage(const TalReportingSessionMessage::Pointer& message,
                                      const std::function<void()>& reply) {
  assertOnQueue(platform_.reporting_queue);
  ++total_message_count_;
  addMissingDates(*message, platform_.clock.secondsSince1970());
  removeWhiteSpaceFromKeys(*message);
  addAudioMessageTag(*message);
  addAppName(*message);
  platform_.trace_points.emit(TraceCode::kSessionMessage);
  message->setIsSessionStarted(started_);
  message->setIsRedundant(messageIsRedundant(*message));
  TAL_LOG_DEBUG(log(), "TalReportingSessionWorker action=sendMessage reporterID=", reporter_id_,
                " app=", TalReportingUtilityRetrieveAppName(configuration_).text(),
                " redundant=", yesOrNo(message->isRedundant()), " message=", message->message().text());
  previous_values_.merge(message->message());
  if (!message->isRedundant()) kept_.append(message);
  deliver(message);
  if (reply) reply();
}

void TalReportingSession::deliver(const TalReportingSessionMessage::Pointer& message) {
  const auto& destinations = message->destinationWorkers();
  for (WorkerInstance* instance : consuming_message_workers_) {
    if (!instance->worker->started()) continue;
    if (message->isRedundant() && !instance->handles_redundant) continue;
    if (!destinations.empty() &&
        std::find(destinations.begin(), destinations.end(), instance->worker_class) == destinations.end()) {
      continue;
    }
    instance->consumer->handleMessage(message);
    TAL_LOG_DEBUG(log(),
                  "TalReportingSessionWorker action=handleMessage worker=", instance->worker_class->name(),
                  " reporterID=", reporter_id_);
  }
}

bool TalReportingSession::messageIsRedundant(const TalReportingSessionMessage& message) const {
  if (message.type() == AudioEventType::kError || message.category() == AudioEventCategory::kError)
    return false;
  // Only the latest record of the kind is compared, which may be a state message.
  const TalReportingSessionMessage* last = kept_.lastOfKind(message.category(), message.type());
  if (!last || !message.message().equalsIgnoring(last->message(), kTimeKeys)) return false;
  TAL_LOG_DEBUG(log(), "marking event redundant");
  return true;
}

void TalReportingSession::addMissingDates(TalReportingSessionMessage& message, double now) {
  MessageDict& dict = message.mutableMessage();
  const MessageValue* stamp = dict.find(TalReportingMessageKeyTalTimestamp);
  if (!stamp) {
    dict.set(TalReportingMessageKeyInvalidTimestamp, MessageValue::literal("nil"));
    dict.set(TalReportingMessageKeyTalTimestamp, now);
  } else if (stamp->toDouble() < now - kOldestAcceptedSeconds) {
    dict.set(TalReportingMessageKeyInvalidTimestamp, MessageValue(*stamp));
    dict.set(TalReportingMessageKeyTalTimestamp, now);
  }
}

void TalReportingSession::removeWhiteSpaceFromKeys(TalReportingSessionMessage& message) {
  MessageDict& dict = message.mutableMessage();
  if (!dict.hasKeyWithBlank()) return;
  // Built anew rather than key by key in place, which a message of ten thousand
  // such keys would turn into a day's work.
  MessageDict renamed;
  for (const auto& [key, value] : dict) {
    if (!hasBlank(key)) renamed.set(key, value);
  }
  for (const auto& [key, value] : dict) {
    if (!hasBlank(key)) continue;
    std::string name(key);
    std::replace(name.begin(), name.end(), ' ', '_');
    renamed.set(name, value);
  }
  dict = std::move(renamed);
}

void TalReportingSession::addAudioMessageTag(TalReportingSessionMessage& message) {
  message.mutableMessage().set(TalReportingMessageKeyAudioTag, audioTag(message.category(), message.type()));
}

void TalReportingSession::addAppName(TalReportingSessionMessage& message) const {
  const MessageValue* name = message.message().find(TalReportingApplicationName);
  if (name && !(name->isString() && name->string() == kUnknownApplicationName)) return;
  message.mutableMessage().set(TalReportingApplicationName,
                               TalReportingUtilityRetrieveAppName(configuration_));
}

}  // namespace tal
