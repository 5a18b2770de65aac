#pragma once

#include "platform/ProcessTable.h"

namespace tal {

/// The process table as /proc shows it. Any thread.
class LinuxProcessTable final : public ProcessTable {
 public:
  /// The kernel's name of the process: at most 15 bytes, chosen by the process
  /// itself, so any bytes but NUL.
  std::optional<std::string> processName(std::int32_t process_identifier) const override;
  std::int32_t ownProcessIdentifier() const override;
};

}  // namespace tal
