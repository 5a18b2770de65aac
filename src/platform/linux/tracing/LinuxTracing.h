#pragma once

// Performance tracing on Linux, put together.

#include <filesystem>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/DiagnosticLog.h"
#include "platform/TracingPlatform.h"
#include "platform/linux/tracing/JsonPerfDataWriter.h"
#include "platform/linux/tracing/LinuxClientFiles.h"
#include "platform/linux/tracing/LinuxPerftrailService.h"
#include "platform/linux/tracing/SkeinLibraryLoader.h"
#include "platform/linux/tracing/XmlPropertyLists.h"

namespace tal {

/// Owns what the bundle refers to. Costs nothing until a session is traced.
class LinuxTracing {
 public:
  struct Options {
    std::filesystem::path log_directory;
    std::filesystem::path runtime_directory;
    DiagnosticLog& diagnostic_log;
    const Clock& clock;
    const LogChannel& log;
  };

  explicit LinuxTracing(const Options& options);
  LinuxTracing(const LinuxTracing&) = delete;
  LinuxTracing& operator=(const LinuxTracing&) = delete;

  const TracingPlatform& platform() const { return platform_; }

 private:
  LinuxPerftrailService perftrail_;
  SkeinLibraryLoader skein_;
  JsonPerfDataWriters perf_data_;
  LinuxClientFiles client_files_;
  XmlPropertyLists property_lists_;
  const TracingPlatform platform_;
};

}  // namespace tal
