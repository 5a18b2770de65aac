#include "workers/sinks/TalReportingSessionRtcWorker.h"

#include <algorithm>
#include <utility>

namespace tal {

namespace {

constexpr std::string_view kCallstatQueueLabel = "org.vantle.talsys.session.callstat";

std::string userServiceName(const TalReportingSession& session) {
  if (session.isSingleMessageSession()) {
    return std::string(TalReportingUtilityGenerateServiceNameFromServiceType(session.serviceType()));
  }
  return std::string(session.serviceName()) + "_session";
}

}  // namespace

std::uint16_t retrieveCallstatCategoryFromCategory(AudioEventCategory category) {
  return static_cast<std::uint16_t>(static_cast<std::uint32_t>(category));
}

bool shouldBatchCallstatEventsForServiceType(AudioServiceType type) {
  return type != AudioServiceType::kApiusage;
}

TalReportingSessionRtcWorker::~TalReportingSessionRtcWorker() {
  if (traffic_) traffic_->abandon();
}

std::optional<bool> TalReportingSessionRtcWorker::start() {
  if (session_.serviceType() == AudioServiceType::kTest) return false;
  if (!traffic_) {
    const Platform& platform = session_.platform();
    traffic_ = std::make_shared<CallstatTraffic>(
        CallstatTraffic::Dependencies{.backend = platform.callstat,
                                      .log = platform.log.callstat,
                                      .queue = platform.queue_pool.makeQueue(kCallstatQueueLabel),
                                      .internal_build = platform.internal_build});
  }
  traffic_->start({.reporter_id = session_.reporterID(),
                   .service_type = session_.serviceType(),
                   .service_name = userServiceName(session_),
                   .configuration = session_.configuration().deepCopy()});
  return true;
}

bool TalReportingSessionRtcWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  // The record is everybody's and may be extended by others; the copy shares its
  // values until one of the two changes.
  traffic_->deliver(
      TalReportingSessionMessage::initWithMessage(message->message(), message->category(), message->type()));
  return false;
}

void TalReportingSessionRtcWorker::stop() {
  CallstatTraffic::Closing closing{.reporter_id = session_.reporterID(),
                                   .service_type = session_.serviceType(),
                                   .has_messages = !session_.messages().empty(),
                                   .summarised = {}};
  // A long session's messages are not copied for nobody.
  if (!traffic_->isUnstartedForGood()) {
    for (const auto& message : session_.messages()) {
      if (belongsInSummary(*message)) closing.summarised.push_back(message->message().deepCopy());
    }
  }
  traffic_->stop(std::move(closing));
}

// Asked of the original: a record's copy goes to all workers.
bool TalReportingSessionRtcWorker::belongsInSummary(const TalReportingSessionMessage& message) const {
  const auto& destinations = message.destinationWorkers();
  return !message.isRedundant() && message.isSessionStarted() &&
         (destinations.empty() ||
          std::find(destinations.begin(), destinations.end(), &own_class_) != destinations.end());
}

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionRtcWorkerClass::initWithSession(
    TalReportingSession& session) {
  if (session.serviceType() == AudioServiceType::kTest) return nullptr;
  return std::make_unique<TalReportingSessionRtcWorker>(session, *this);
}

}  // namespace tal
