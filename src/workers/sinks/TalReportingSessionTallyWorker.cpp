#include "workers/sinks/TalReportingSessionTallyWorker.h"

namespace tal {

namespace {

// Clients may send any numbers for category and type; the named ones, for all
// services, are fewer than this.
constexpr std::size_t kMostCachedNames = 8192;

constexpr std::uint64_t kindOf(AudioEventCategory category, AudioEventType type, AudioServiceType service) {
  return std::uint64_t{static_cast<std::uint32_t>(category)} << 32 |
         std::uint64_t{static_cast<std::uint16_t>(type)} << 16 | static_cast<std::uint16_t>(service);
}

TallyEventNames::Names makeNames(AudioEventCategory category, AudioEventType type, AudioServiceType service) {
  std::string kind = TalReportingUtilityCategoryString(category);
  kind += '.';
  kind += TalReportingUtilityTypeString(type);
  std::string service_name = "org.vantle.";
  service_name += TalReportingUtilityGenerateServiceNameFromServiceType(service);
  return {"org.vantle.talsys." + kind, service_name + '.' + kind};
}

}  // namespace

const TallyEventNames::Names& TallyEventNames::namesFor(AudioEventCategory category, AudioEventType type,
                                                        AudioServiceType service) {
  const std::uint64_t kind = kindOf(category, type, service);
  if (const auto found = names_.find(kind); found != names_.end()) return found->second;
  if (names_.size() >= kMostCachedNames) names_.clear();
  return names_.emplace(kind, makeNames(category, type, service)).first->second;
}

bool TalReportingSessionTallyWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  const auto& names = names_.namesFor(message->category(), message->type(), session_.serviceType());
  send(names.generic, *message);
  send(names.service, *message);
  return false;
}

void TalReportingSessionTallyWorker::send(const std::string& name,
                                          const TalReportingSessionMessage& message) {
  if (!sink_.eventIsWanted(name)) return;
  // The copy is made only for an event that is really recorded.
  sink_.sendEventWithPayloadProvider(name, [&message] { return message.message(); });
}

TalReportingSessionTallyWorkerClass::TalReportingSessionTallyWorkerClass(AnalyticsSink& sink)
    : TalReportingSessionWorkerClass(
          "TalReportingSessionTallyWorker",
          {.is_consumer = true, .start_on_init = true, .handle_single_message_session = true}),
      sink_(sink) {}

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionTallyWorkerClass::initWithSession(
    TalReportingSession& session) {
  return std::make_unique<TalReportingSessionTallyWorker>(session, sink_, names_);
}

}  // namespace tal
