#pragma once

// The one place that names every worker class.

#include <memory>

#include "platform/Platform.h"
#include "session/WorkerRoster.h"
#include "system/TalReportingSystemMonitor.h"

namespace tal {

/// The full roster, in its fixed order. Platform and monitor outlive it.
std::unique_ptr<WorkerRoster> makeWorkerRoster(const Platform& platform,
                                               const TalReportingSystemMonitor& system_monitor);

}  // namespace tal
