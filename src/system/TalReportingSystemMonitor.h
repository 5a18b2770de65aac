#pragma once

// Keeps the current state of the few system features that matter to audio
// reports: read at the start, read anew whenever a feature's notification is
// posted, and shown to all sessions through one observable dictionary.

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageDict.h"
#include "platform/Platform.h"
#include "system/SystemMonitorDictionary.h"

namespace tal {

/// The service's own notification: its settings have changed.
inline constexpr std::string_view gReportingNotifydNotificationName = "org.vantle.talsys.reporting";

/// One per process, made by `main`, brought to life by the service.
///
/// 1. created: knows nothing and listens to nothing;
/// 2. `initializeWithQueue`: reads all features, then listens. In this order,
///    deliberately: what a notification's state alone tells ("ringerstate") is
///    unknown until it is posted for the first time;
/// 3. `reset`, or destruction: listens no more.
///
/// Features and their sources:
///
/// - "spatial-audio-accessory-feature": that key of the settings domain
///   "org.vantle.homeshell"; read anew at
///   "org.vantle.homeshell.spatial-audio-accessory-feature.changed";
/// - "device_name": that key of "org.vantle.talsys"; at "org.vantle.talsys.reporting";
/// - "ringerstate": true when the state of the notification
///   "org.vantle.homeshell.ringerstate" is 1; at that notification.
///
/// A feature state holds the value, as it is stored, under the feature's name,
/// "talreporting_timestamp" (seconds since 1970) and "systemuptime_sec" (whole
/// seconds) of the reading. A state without its value is never filed: a feature
/// that does not read keeps the state it has.
///
/// Handlers of notifications run on the queue. Everything else is called before
/// that queue serves anybody, on it, or after its end.
class TalReportingSystemMonitor {
 public:
  /// What the platform refers to outlives the monitor.
  explicit TalReportingSystemMonitor(const Platform& platform);
  TalReportingSystemMonitor(const TalReportingSystemMonitor&) = delete;
  TalReportingSystemMonitor& operator=(const TalReportingSystemMonitor&) = delete;
  ~TalReportingSystemMonitor();

  /// A second call does nothing, even with another queue. `queue` lives until `reset`.
  void initializeWithQueue(SerialQueue& queue);

  /// The dictionary itself; null before `initializeWithQueue` and after `reset`.
  /// Whoever holds it after a `reset` holds the old one.
  std::shared_ptr<SystemMonitorDictionary> getSystemMonitorDictionary() const { return dictionary_; }
  /// The names of the features, in the order of the table; none while not initialised.
  std::vector<std::string> getSystemMonitorKeys() const;

  /// `clear`, and forgets everything.
  void reset();

  /// Files the state of every feature that has one.
  void populateInitialValues();
  /// Registers for every feature's notification; one that fails is logged.
  void listenForFeatureStateChanges();
  /// Cancels these registrations. The states remain.
  void clear();

  /// "device_name" (text, where set) and "disable_reporting" (boolean where set,
  /// else the integer 0), as they are stored now.
  MessageDict TalReportingDefaults() const;
  /// The same as they were at `initializeWithQueue`. Nothing in the system acts on them.
  const MessageDict& getDefaults() const { return defaults_; }

  /// The feature's state as it is now, or nothing.
  std::optional<MessageDict> getFeatureState(std::string_view feature) const;

 private:
  const LogChannel& log() const { return platform_.log.service; }
  const MessageDict* descriptorOf(std::string_view feature) const;
  std::optional<MessageValue> readFeature(std::string_view feature, const MessageDict& descriptor) const;
  void listenForFeature(std::string_view feature);
  void featureChanged(const std::string& feature, NotifyCenter::Token token);

  const Platform& platform_;
  SerialQueue* queue_ = nullptr;
  /// Feature name -> descriptor. Changed under the dictionary's lock.
  MessageDict features_;
  MessageDict defaults_;
  std::shared_ptr<SystemMonitorDictionary> dictionary_;
};

}  // namespace tal
