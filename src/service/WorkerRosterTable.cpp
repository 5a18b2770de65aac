#include "service/WorkerRosterTable.h"

#include <utility>
#include <vector>

#include "accessories/TalReportingSessionAudioRegistrationWorker.h"
#include "drivers/TalReportingSessionDriverSnapshotWorker.h"
#include "drivers/TalReportingSessionMemoryLogWorker.h"
#include "session/DecliningWorkerClass.h"
#include "system/TalReportingSessionSystemMonitorWorker.h"
#include "tracing/TalReportingSessionTraceWorker.h"
#include "workers/derived/TalReportingSessionHuddleMessagesWorker.h"
#include "workers/derived/TalReportingSessionInputMessagesWorker.h"
#include "workers/derived/TalReportingSessionVolumeMessagesWorker.h"
#include "workers/diagnostics/TalReportingSessionHoundWorker.h"
#include "workers/diagnostics/TalReportingSessionTapToKiteWorker.h"
#include "workers/sinks/TalReportingSessionDPWorker.h"
#include "workers/sinks/TalReportingSessionEnergylogWorker.h"
#include "workers/sinks/TalReportingSessionPlumeWorker.h"
#include "workers/sinks/TalReportingSessionRtcWorker.h"
#include "workers/sinks/TalReportingSessionSummaryJsonFileWorker.h"
#include "workers/sinks/TalReportingSessionSummaryWorker.h"
#include "workers/sinks/TalReportingSessionTallyWorker.h"

namespace tal {

namespace {

std::unique_ptr<TalReportingSessionWorkerClass> traceWorkerClass(const Platform& platform) {
  constexpr TalReportingSessionWorkerClass::Traits kNeitherConsumerNorProducer{};
  if (!platform.tracing) {
    return std::make_unique<DecliningWorkerClass>("TalReportingSessionTraceWorker",
                                                  kNeitherConsumerNorProducer);
  }
  return std::make_unique<TalReportingSessionTraceWorkerClass>(*platform.tracing);
}

}  // namespace

std::unique_ptr<WorkerRoster> makeWorkerRoster(const Platform& platform,
                                               const TalReportingSystemMonitor& system_monitor) {
  std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
  classes.push_back(traceWorkerClass(platform));
  classes.push_back(std::make_unique<TalReportingSessionVolumeMessagesWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionHuddleMessagesWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionSummaryWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionInputMessagesWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionTallyWorkerClass>(platform.analytics));
  classes.push_back(std::make_unique<TalReportingSessionEnergylogWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionMemoryLogWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionPlumeWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionDriverSnapshotWorkerClass>(platform));
  classes.push_back(std::make_unique<TalReportingSessionSystemMonitorWorkerClass>(system_monitor));
  classes.push_back(std::make_unique<TalReportingSessionHoundWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionDPWorkerClass>(platform));
  classes.push_back(std::make_unique<TalReportingSessionSummaryJsonFileWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionAudioRegistrationWorkerClass>(platform));
  classes.push_back(std::make_unique<TalReportingSessionRtcWorkerClass>());
  classes.push_back(std::make_unique<TalReportingSessionTapToKiteWorkerClass>());
  return std::make_unique<WorkerRoster>(std::move(classes), platform.log.session);
}

}  // namespace tal
