#include "system/TalReportingSystemMonitor.h"

#include <utility>

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

// Keys of a feature's descriptor.
constexpr MessageKey kDefaultsDomain{"defaults_domain"};  // absent: the notification's state is the source
constexpr MessageKey kFeatureDomain{"feature_domain"};
constexpr MessageKey kNotification{"notification"};
constexpr MessageKey kNotifyToken{"notify_token"};

constexpr std::string_view kReportingDomain = "org.vantle.talsys";
constexpr MessageKey kDeviceName{"device_name"};
constexpr MessageKey kDisableReporting{"disable_reporting"};

MessageDict makeFeatures() {
  MessageDict features;
  const auto add = [&features](MessageKey feature, MessageDict descriptor) {
    descriptor.set(kFeatureDomain, MessageValue::literal(feature.text));
    features.set(feature, std::move(descriptor));
  };
  add(TalReportingMessageKeySpatialAudioAccessoryFeature,
      {{kDefaultsDomain, TalReportingMessageKeySpatialAudioAccessoryFeatureDomain},
       {kNotification, "org.vantle.homeshell.spatial-audio-accessory-feature.changed"}});
  add(kDeviceName, {{kDefaultsDomain, kReportingDomain}, {kNotification, gReportingNotifydNotificationName}});
  add(TalReportingMessageKeyRingerState, {{kNotification, "org.vantle.homeshell.ringerstate"}});
  return features;
}

NotifyCenter::Token tokenIn(const MessageDict& descriptor) {
  const MessageValue* token = descriptor.find(kNotifyToken);
  return token ? static_cast<NotifyCenter::Token>(token->toInt64()) : 0;
}

}  // namespace

TalReportingSystemMonitor::TalReportingSystemMonitor(const Platform& platform) : platform_(platform) {}

TalReportingSystemMonitor::~TalReportingSystemMonitor() { clear(); }

void TalReportingSystemMonitor::initializeWithQueue(SerialQueue& queue) {
  if (dictionary_) return;
  defaults_ = TalReportingDefaults();
  queue_ = &queue;
  features_ = makeFeatures();
  dictionary_ = std::make_shared<SystemMonitorDictionary>();
  populateInitialValues();
  listenForFeatureStateChanges();
}

std::vector<std::string> TalReportingSystemMonitor::getSystemMonitorKeys() const {
  std::vector<std::string> keys;
  keys.reserve(features_.size());
  for (const auto& [feature, descriptor] : features_) keys.emplace_back(feature);
  return keys;
}

void TalReportingSystemMonitor::reset() {
  clear();
  dictionary_.reset();
  features_ = {};
  defaults_ = {};
  queue_ = nullptr;
}

MessageDict TalReportingSystemMonitor::TalReportingDefaults() const {
  SettingsStore& settings = platform_.settings;
  settings.refresh(kReportingDomain);
  MessageDict defaults;
  if (const auto name = settings.value(kReportingDomain, kDeviceName.text)) {
    defaults.set(kDeviceName, name->text());
  }
  const auto disabled = settings.value(kReportingDomain, kDisableReporting.text);
  // An integer where nothing is set, deliberately: its readers take it as false.
  defaults.set(kDisableReporting, disabled ? MessageValue(disabled->toBool()) : MessageValue(0));
  return defaults;
}

const MessageDict* TalReportingSystemMonitor::descriptorOf(std::string_view feature) const {
  const MessageValue* descriptor = features_.find(feature);
  return descriptor ? descriptor->dict() : nullptr;
}

std::optional<MessageValue> TalReportingSystemMonitor::readFeature(std::string_view feature,
                                                                   const MessageDict& descriptor) const {
  if (const MessageValue* domain = descriptor.find(kDefaultsDomain)) {
    // Whoever posts has just written; an ordinary look-up might not see it yet.
    platform_.settings.refresh(domain->string());
    return platform_.settings.value(domain->string(), feature);
  }
  if (!descriptor.contains(kNotifyToken)) return std::nullopt;
  const NotifyCenter::State state = platform_.notify_center.getState(tokenIn(descriptor));
  if (state.status != NotifyStatus::kOk) return std::nullopt;
  return state.value == 1;
}

std::optional<MessageDict> TalReportingSystemMonitor::getFeatureState(std::string_view feature) const {
  TAL_LOG(log(), "getting feature ", feature);
  const MessageDict* descriptor = descriptorOf(feature);
  if (!descriptor || !descriptor->contains(kFeatureDomain)) return std::nullopt;
  const std::optional<MessageValue> value = readFeature(feature, *descriptor);
  if (!value) return std::nullopt;
  const TimeReading now = platform_.clock.read();
  return MessageDict{
      {feature, *value},
      {TalReportingInternalEventEpochTime, now.seconds_since_1970},
      {TalReportingInternalEventSystemUptimeSec, TalReportingUtilityNearestInt32(now.uptime_seconds)}};
}

void TalReportingSystemMonitor::populateInitialValues() {
  if (!dictionary_) return;
  TAL_LOG_INFO(log(), "populateInitialValues ", features_.text());
  const auto held = dictionary_->lock();
  for (const std::string& feature : getSystemMonitorKeys()) {
    if (auto state = getFeatureState(feature)) dictionary_->file(feature, std::move(*state));
  }
}

void TalReportingSystemMonitor::listenForFeatureStateChanges() {
  if (!dictionary_) return;
  TAL_LOG_INFO(log(), "listening for features ", features_.text());
  // The first handler may run on the queue before the last token is filed.
  const auto held = dictionary_->lock();
  for (const std::string& feature : getSystemMonitorKeys()) listenForFeature(feature);
}

void TalReportingSystemMonitor::listenForFeature(std::string_view feature) {
  MessageDict descriptor = *descriptorOf(feature);
  const MessageValue* notification = descriptor.find(kNotification);
  if (!notification) return;
  const auto [status, token] = platform_.notify_center.registerDispatch(
      notification->string(), *queue_,
      [this, name = std::string(feature)](NotifyCenter::Token fired) { featureChanged(name, fired); });
  descriptor.set(kNotifyToken, token);
  features_.set(feature, std::move(descriptor));
  TAL_LOG(log(), "notify setup result ", static_cast<std::uint32_t>(status), " token ", token);
}

void TalReportingSystemMonitor::featureChanged(const std::string& feature, NotifyCenter::Token token) {
  assertOnQueue(*queue_);
  TAL_LOG_INFO(log(), "feature changes featureName=", feature, " token=", token);
  const auto held = dictionary_->lock();
  std::optional<MessageDict> state = getFeatureState(feature);
  if (!state || dictionary_->stateOf(feature) == state) return;
  dictionary_->file(feature, std::move(*state));
  TAL_LOG_DEBUG(log(), "Updating value featureName=", feature);
}

void TalReportingSystemMonitor::clear() {
  for (const auto& [feature, descriptor] : features_) {
    platform_.notify_center.cancel(tokenIn(*descriptor.dict()));
  }
}

}  // namespace tal
