#pragma once

// What a test client puts into its session's configuration to have it traced.

#include <string_view>

#include "core/MessageKey.h"

namespace tal {

/// Path of the probe list; nothing is traced without one.
inline constexpr MessageKey kSkeinPlistFilePathKey{"TalReportingSkeinPlistFilePath"};
/// One of the words below; anything but the profiling word is the default.
inline constexpr MessageKey kTraceTypeKey{"TalReportingTraceType"};
inline constexpr MessageKey kSkeinOutputFileNameKey{"TalReportingSkeinOutputFileName"};
inline constexpr MessageKey kSkeinOutputFileDirectoryKey{"TalReportingSkeinOutputFileDirectory"};
/// Names of the processes that probes of kind "cpu" watch.
inline constexpr MessageKey kPerfProcessesKey{"TalReportingPerfProcesses"};
/// Seconds to go on recording after the session's stop.
inline constexpr MessageKey kPerfEndDelayKey{"TalReportingPerfEndDelay"};
inline constexpr MessageKey kTestNameKey{"TalReportingTestName"};

// Words for the trace type.
inline constexpr std::string_view kTraceTypeKernel = "ktrace";
inline constexpr std::string_view kTraceTypeDefault = "sktrace";
inline constexpr std::string_view kTraceTypeProfile = "sktrace_profile";

}  // namespace tal
