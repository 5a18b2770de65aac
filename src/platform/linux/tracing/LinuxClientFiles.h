#pragma once

#include <filesystem>

#include "platform/ClientFiles.h"

namespace tal {

/// Checks what a client names part by part against the client's own rights. Files
/// made for a client are readable by all, and belong to it where the daemon may
/// give them away.
class LinuxClientFiles final : public ClientFiles {
 public:
  explicit LinuxClientFiles(std::filesystem::path diagnostic_log)
      : diagnostic_log_(std::move(diagnostic_log)) {}

  Contents read(const ClientIdentity* client, std::string_view path, std::size_t most_bytes) override;
  OpenedDirectory openDirectory(const ClientIdentity* client, std::string_view path) override;
  OpenedDirectory openDiagnosticDirectory(std::string_view place) override;

 private:
  const std::filesystem::path diagnostic_log_;
};

}  // namespace tal
