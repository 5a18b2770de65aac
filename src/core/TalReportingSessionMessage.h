#pragma once

// One message on its way through a session: the dictionary, its category and
// type, and the marks that intake sets on it.

#include <memory>
#include <string>
#include <vector>

#include "core/EventVocabulary.h"
#include "core/Log.h"
#include "core/MessageDict.h"

namespace tal {

class TalReportingSessionWorkerClass;

/// A message record, shared by the session that keeps it and its consumers.
/// Lives on the reporting queue.
class TalReportingSessionMessage {
 public:
  using Pointer = std::shared_ptr<TalReportingSessionMessage>;
  using WorkerClasses = std::vector<const TalReportingSessionWorkerClass*>;

  /// The record has a dictionary of its own; nested values stay shared.
  static Pointer initWithMessage(MessageDict message, AudioEventCategory category, AudioEventType type) {
    return std::make_shared<TalReportingSessionMessage>(std::move(message), category, type);
  }

  TalReportingSessionMessage(MessageDict message, AudioEventCategory category, AudioEventType type)
      : message_(std::move(message)), category_(category), type_(type) {}

  const MessageDict& message() const { return message_; }
  /// The dictionary itself: changes show to everyone who holds the record.
  MessageDict& mutableMessage() { return message_; }

  AudioEventCategory category() const { return category_; }
  AudioEventType type() const { return type_; }

  /// True when it repeats the last kept message of its kind.
  bool isRedundant() const { return is_redundant_; }
  void setIsRedundant(bool redundant) { is_redundant_ = redundant; }

  /// True when the session was started as the message arrived.
  bool isSessionStarted() const { return is_session_started_; }
  void setIsSessionStarted(bool started) { is_session_started_ = started; }

  /// Only workers of these classes receive the message; empty: all. The class
  /// objects outlive every record.
  const WorkerClasses& destinationWorkers() const;
  void setDestinationWorkers(WorkerClasses classes);

  /// "category=… type=… {…}".
  std::string description() const;

  /// A record with a deep copy of the dictionary and the same marks. Goes to all
  /// workers: the destination workers are deliberately not copied.
  Pointer copy(const LogChannel& log) const;

  /// The seconds under "talreporting_timestamp", 0 when absent.
  double epochTime() const;

  /// Sorts by `epochTime`, stably: records without a stamp come first.
  static void sortMessages(std::vector<Pointer>& messages);

 private:
  MessageDict message_;
  // Almost no record has any, so the list stays out of the record.
  std::unique_ptr<const WorkerClasses> destination_workers_;
  AudioEventCategory category_;
  AudioEventType type_;
  bool is_redundant_ = false;
  bool is_session_started_ = false;
};

}  // namespace tal
