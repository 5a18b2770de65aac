// Stands in for SdtTracePoints.cpp on a build machine without sys/sdt.h.

#include "platform/linux/process/SdtTracePoints.h"

namespace tal {

void SdtTracePoints::emit(TraceCode) {}

}  // namespace tal
