#pragma once

#include <functional>
#include <memory>

#include "platform/ClientFiles.h"
#include "platform/CountingSemaphore.h"
#include "platform/PerfDataWriter.h"
#include "platform/PerftrailService.h"
#include "platform/PropertyLists.h"
#include "platform/SkeinTraceModel.h"

namespace tal {

/// What performance tracing needs of its host. Owns nothing.
struct TracingPlatform {
  PerftrailService& perftrail;
  SkeinLibrary& skein;
  PerfDataWriters& perf_data;
  ClientFiles& client_files;
  const PropertyLists& property_lists;
  std::function<std::unique_ptr<CountingSemaphore>()> make_semaphore;
};

}  // namespace tal
