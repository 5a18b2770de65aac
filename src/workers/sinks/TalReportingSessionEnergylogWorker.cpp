#include "workers/sinks/TalReportingSessionEnergylogWorker.h"

#include "core/MessageKeys.h"
#include "core/TalReportingUtility.h"

namespace tal {

namespace {

// The class of registered events.
constexpr std::int32_t kRegisteredEvents = 28;

// In messages.
constexpr MessageKey kEngineOnTime{"EngineOnTime"};
constexpr MessageKey kEngineState{"EngineState"};
constexpr std::string_view kEngineIsOn{"EngineOn"};

// In both.
constexpr MessageKey kActiveHardwareTime{"Haptic_Active_Hardware_Time_Seconds"};
constexpr MessageKey kActiveClients{"Active_Clients"};

// In events.
constexpr MessageKey kEngineOnDuration{"EngineOnDuration"};
constexpr MessageKey kStatus{"Status"};
constexpr MessageKey kApplicationName{"ApplicationName"};
constexpr MessageKey kTimestampEnd{"TimestampEnd"};

bool isText(const MessageValue& value, std::string_view text) {
  return value.isString() && value.string() == text;
}

}  // namespace

bool TalReportingSessionEnergylogWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (message->type() != AudioEventType::kEnergylog) return false;
  handleEngineOnDurationMessage(message->message());
  handleEngineStateMessage(message->message());
  handleLongRunningMessage(message->message());
  return false;
}

void TalReportingSessionEnergylogWorker::handleEngineOnDurationMessage(const MessageDict& message) {
  const MessageValue* on_time = message.find(kEngineOnTime);
  if (!on_time) return;
  MessageDict payload{{kEngineOnDuration, *on_time}};
  const MessageValue name = TalReportingUtilityRetrieveAppName(session_.configuration());
  if (isText(name, kUnknownApplicationName)) {
    TAL_LOG_ERROR(log(), "failed to get app name for energylog");
  } else {
    payload.set(kApplicationName, name);
  }
  if (const MessageValue* time = message.find(TalReportingInternalEventEpochTime)) {
    payload.set(kTimestampEnd, *time);
  } else {
    TAL_LOG_ERROR(log(), "failed to get TalReporting timestamp for energylog");
  }
  send("Vidra_Haptics_EngineOnDuration", payload);
}

void TalReportingSessionEnergylogWorker::handleEngineStateMessage(const MessageDict& message) {
  const MessageValue* state = message.find(kEngineState);
  if (!state) return;
  MessageDict payload{{kStatus, isText(*state, kEngineIsOn) ? 1 : 0}};
  // Deliberately also when it is "Unknown", unlike above: reports rely on it.
  payload.set(kApplicationName, TalReportingUtilityRetrieveAppName(session_.configuration()));
  if (const MessageValue* time = message.find(TalReportingInternalEventEpochTime)) {
    payload.set(kTimestampEnd, *time);
  }
  send("Vidra_Haptics_ClientStatus", payload);
}

void TalReportingSessionEnergylogWorker::handleLongRunningMessage(const MessageDict& message) {
  const MessageValue* active_time = message.find(kActiveHardwareTime);
  if (!active_time) return;
  MessageDict payload{{kActiveHardwareTime, *active_time}};
  if (const MessageValue* clients = message.find(kActiveClients)) payload.set(kActiveClients, *clients);
  send("LeakedHapticsSessionInfo", payload);
}

void TalReportingSessionEnergylogWorker::send(std::string_view name, const MessageDict& payload) {
  session_.platform().energylog.logRegisteredEvent(kRegisteredEvents, name, payload);
}

}  // namespace tal
