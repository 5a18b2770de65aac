#pragma once

#include <utility>
#include <vector>

#include "platform/FlutterRequestService.h"

namespace tal::test {

/// Keeps what it was asked for.
class FakeFlutterRequestService final : public FlutterRequestService {
 public:
  void requestFlutter(FlutterRequest request) override { requests.push_back(std::move(request)); }

  std::vector<FlutterRequest> requests;
};

}  // namespace tal::test
