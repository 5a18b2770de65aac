#include "session/WorkerRoster.h"

#include <utility>

namespace tal {

WorkerRoster::WorkerRoster(std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes,
                           const LogChannel& log)
    : owned_(std::move(classes)) {
  for (const auto& owned : owned_) {
    TalReportingSessionWorkerClass* worker_class = owned.get();
    all_.push_back(worker_class);
    if (!worker_class->answersInitWithSession()) {
      TAL_LOG_DEBUG(log, "Worker does not implement initWithSession! ", worker_class->name());
      continue;
    }
    valid_.push_back(worker_class);
    if (worker_class->isConsumer()) consumers_.push_back(worker_class);
    if (worker_class->isProducer()) producers_.push_back(worker_class);
    if (worker_class->startOnInit()) start_on_init_.push_back(worker_class);
  }
}

}  // namespace tal
