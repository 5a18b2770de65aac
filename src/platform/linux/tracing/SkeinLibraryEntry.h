#pragma once

// How the trace-model library is reached: one function that answers with the
// class of a name, or null. Its name changes with SkeinTraceModel.h.

inline constexpr char kSkeinEntryName[] = "talreporting_skein_class_1";
using SkeinEntry = void* (*)(const char* class_name);

inline constexpr char kSkeinTraceModelClassName[] = "SkeinTraceModel";
inline constexpr char kSkeinSignpostModelClassName[] = "SkeinSignpostModel";
inline constexpr char kSkeinProbeFactoryClassName[] = "SkeinProbeFactory";

/// The library makes no model unless this is set to 1: whoever uses it has
/// understood that it holds a whole trace in memory.
inline constexpr char kSkeinAcknowledgement[] = "TALREPORTING_SKEIN_ACKNOWLEDGED";
