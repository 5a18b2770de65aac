#include "platform/linux/process/SdtTracePoints.h"

#include <sys/sdt.h>

namespace tal {

void SdtTracePoints::emit(TraceCode code) {
  const auto number = static_cast<std::uint32_t>(code);
  switch (code) {
    case TraceCode::kClientCreate:
      DTRACE_PROBE1(talreporting, client_create, number);
      break;
    case TraceCode::kClientStart:
      DTRACE_PROBE1(talreporting, client_start, number);
      break;
    case TraceCode::kClientStop:
      DTRACE_PROBE1(talreporting, client_stop, number);
      break;
    case TraceCode::kClientDestroy:
      DTRACE_PROBE1(talreporting, client_destroy, number);
      break;
    case TraceCode::kClientSendMessage:
      DTRACE_PROBE1(talreporting, client_send_message, number);
      break;
    case TraceCode::kSessionCreated:
      DTRACE_PROBE1(talreporting, session_created, number);
      break;
    case TraceCode::kSessionStarted:
      DTRACE_PROBE1(talreporting, session_started, number);
      break;
    case TraceCode::kSessionEnding:
      DTRACE_PROBE1(talreporting, session_ending, number);
      break;
    case TraceCode::kSessionDestroyed:
      DTRACE_PROBE1(talreporting, session_destroyed, number);
      break;
    case TraceCode::kSessionMessage:
      DTRACE_PROBE1(talreporting, session_message, number);
      break;
  }
}

}  // namespace tal
