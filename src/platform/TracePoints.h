#pragma once

#include <cstdint>

namespace tal {

/// The fixed codes that mark the life of sessions for kernel tracing tools.
/// Their numbers are relied on outside this program.
enum class TraceCode : std::uint32_t {
  kClientCreate = 0x21044814,
  kClientStart = 0x21044818,
  kClientStop = 0x2104481c,
  kClientDestroy = 0x21044820,
  kClientSendMessage = 0x21044824,
  kSessionCreated = 0x21044828,
  kSessionStarted = 0x2104482c,
  kSessionEnding = 0x21044830,
  kSessionDestroyed = 0x21044834,
  kSessionMessage = 0x21044838,
};

/// The kernel trace facility. Any thread; costs next to nothing while nobody traces.
class TracePoints {
 public:
  virtual ~TracePoints() = default;
  virtual void emit(TraceCode code) = 0;
};

}  // namespace tal
