#pragma once

#include <array>
#include <string>

#include "core/MessageDict.h"

namespace tal {

/// What a capture of a hang trace (a "flutter") is asked for with.
struct FlutterRequest {
  std::string domain;  ///< who asks, "org.vantle.talsys"
  std::string type;    ///< the kind of trouble, "AudioOverloads"
  std::string description;
  /// Shares nothing with anybody else's dictionary.
  MessageDict payload;
  /// Switches of the service's own, handed through as they are.
  std::array<bool, 5> flags{};
};

/// Captures what the whole machine was doing when something hung.
///
/// Called on the reporting queue: must not block. Nothing is answered; a service
/// that cannot capture says so in the log.
class FlutterRequestService {
 public:
  virtual ~FlutterRequestService() = default;

  virtual void requestFlutter(FlutterRequest request) = 0;
};

}  // namespace tal
