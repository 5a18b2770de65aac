#pragma once

#include <mutex>

#include "core/Log.h"

namespace tal {

/// Writes lines to a descriptor, which stays the caller's:
/// "2026-01-31T14:45:02.123456Z talrs default       TalReportingService:123   text".
///
/// Any thread. Each line is one write, and lines do not mix. A line that cannot
/// be written (the descriptor is closed, its reader has gone, a full pipe that
/// does not block) is dropped: logging never ends or fails its caller.
class StderrLogSink final : public LogSink {
 public:
  explicit StderrLogSink(int descriptor = 2) : descriptor_(descriptor) {}

  void write(std::string_view channel, LogLevel level, std::string_view line) override;

 private:
  void writeWhole(std::string_view text);

  int descriptor_;
  std::mutex mutex_;  // a write of more than a pipe takes at once may be cut in two
};

}  // namespace tal
