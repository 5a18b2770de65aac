#pragma once

// The diagnostic-log directory as plain files.

#include <filesystem>

#include "platform/DiagnosticLog.h"

namespace tal {

/// Any thread. A place is made with every directory above it up to the root of
/// the log, which is somebody else's to make and keeps its own permissions.
class LinuxDiagnosticLog final : public DiagnosticLog {
 public:
  explicit LinuxDiagnosticLog(std::filesystem::path root) : root_(std::move(root)) {}

  std::string pathOf(std::string_view place) const override { return (root_ / place).string(); }
  DiagnosticFile::Error makeDirectory(std::string_view place) override;
  /// The file can be read by all, written by the daemon's user alone.
  Opened createFile(std::string_view place, std::string_view name) override;
  DiagnosticFile::Error putFile(std::string_view place, std::string_view name,
                                std::string_view text) override;
  void keepLast(std::string_view place, std::size_t most) override;

 private:
  const std::filesystem::path root_;
};

}  // namespace tal
