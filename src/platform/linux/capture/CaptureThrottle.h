#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/SymptomReporterService.h"

namespace tal {

/// Decides whether one more capture may be taken: of each signature at most one
/// in 60 seconds, and of all a number in any 24 hours. Knows no clock, thread or
/// file; its text form keeps it across restarts.
class CaptureThrottle {
 public:
  CaptureThrottle() = default;
  /// What `text` gave; lines that make no sense are passed over.
  explicit CaptureThrottle(std::string_view text);

  /// Why a capture must be refused now, else nothing. Takes that back which lies
  /// too far behind, and what a clock that was set back has put into the future.
  std::optional<HoundDiagError> refusal(std::string_view signature, double now, std::size_t daily_limit);

  void record(std::string_view signature, double now);
  /// The capture recorded last for the signature was not taken after all.
  void takeBack(std::string_view signature);

  std::string text() const;

 private:
  struct Taken {
    double at;
    std::string signature;  // a hash in hex: what it stands for came from a client
  };

  std::vector<Taken> taken_;
};

}  // namespace tal
