#pragma once

#include "platform/TracePoints.h"

namespace tal {

/// Static probes of the provider "talreporting", one per code and named after
/// it (`client_create`, `session_message`, …) with the code as its argument. A
/// probe that nobody traces is one instruction that does nothing. Where the
/// probes' header is missing at build time, `emit` does nothing at all. Any thread.
class SdtTracePoints final : public TracePoints {
 public:
  void emit(TraceCode code) override;
};

}  // namespace tal
