#pragma once

// Stands in for a recorder of hang traces on a system that has none.

#include "core/Log.h"
#include "platform/FlutterRequestService.h"

namespace tal {

/// Says in the log what would have been captured. Any thread.
class UnavailableFlutterRequestService final : public FlutterRequestService {
 public:
  /// `log` outlives the service.
  explicit UnavailableFlutterRequestService(const LogChannel& log) : log_(log) {}

  void requestFlutter(FlutterRequest request) override {
    TAL_LOG(log_, "no hang trace of type ", request.type, " for \"", request.description,
            "\": this system has no recorder of them");
  }

 private:
  const LogChannel& log_;
};

}  // namespace tal
