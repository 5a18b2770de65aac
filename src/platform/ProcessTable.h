#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tal {

/// What is known of other processes. Any thread.
class ProcessTable {
 public:
  virtual ~ProcessTable() = default;

  /// The short name of a running process, or nothing when it has gone.
  virtual std::optional<std::string> processName(std::int32_t process_identifier) const = 0;

  virtual std::int32_t ownProcessIdentifier() const = 0;
};

}  // namespace tal
