#pragma once

// A draft of a bug report as files: JSON for programs, Markdown for a person who
// pastes it into a bug tracker.

#include <optional>
#include <string>

#include "platform/TapToKiteService.h"

namespace tal {

struct KiteReport {
  KiteDraft draft;
  std::optional<std::string> process_name;
  std::string display_reason;
  std::string name;  ///< of the draft's files, without their endings
  double created_at = 0;
  std::string system;   ///< operating system and kernel
  std::string program;  ///< this daemon and its version
  std::string log_directory;
};

std::string kiteReportAsJson(const KiteReport& report);
std::string kiteReportAsMarkdown(const KiteReport& report);

}  // namespace tal
