#pragma once

#include <cstdint>
#include <vector>

namespace tal {

/// Who a client is to the host, as of its connecting.
struct ClientIdentity {
  std::uint32_t user = 0;
  std::uint32_t group = 0;
  std::vector<std::uint32_t> supplementary_groups = {};
};

}  // namespace tal
