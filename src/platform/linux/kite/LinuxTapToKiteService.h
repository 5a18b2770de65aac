#pragma once

// Drafts of bug reports as files of the diagnostic-log directory, announced on
// the desktop.

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "core/Log.h"
#include "platform/Clock.h"
#include "platform/DiagnosticLog.h"
#include "platform/TapToKiteService.h"
#include "platform/linux/kite/DesktopNotification.h"
#include "platform/linux/kite/KiteReport.h"
#include "platform/linux/process/BackgroundWork.h"

namespace tal {

/// Where the drafts go, below the diagnostic-log directory.
inline constexpr std::string_view kDraftsPlace = "Audio/Drafts";
/// So many are kept; then a new one takes the place of the oldest.
inline constexpr std::size_t kMostDrafts = 50;

/// Writes `<time>-<id>.md` and `<time>-<id>.json`, the latter last, and tells the
/// desktop. Any thread; disk and bus are waited for on a thread of its own. The
/// destructor finishes the drafts that wait.
class LinuxTapToKiteService final : public TapToKiteService {
 public:
  using Show = std::function<std::optional<std::string>(const DesktopNotification&)>;

  struct Dependencies {
    DiagnosticLog& diagnostic_log;
    const Clock& clock;
    const LogChannel& log;
    std::string program;  ///< "talreportingd 0.1.0"
    Show show = showDesktopNotification;
  };

  /// What the dependencies refer to outlives the object.
  explicit LinuxTapToKiteService(Dependencies dependencies) : dependencies_(std::move(dependencies)) {}

  void createDraft(KiteDraft draft, std::optional<std::string> process_name, std::string display_reason,
                   Completion completion) override;

 private:
  std::optional<std::string> write(const KiteReport& report);
  std::optional<std::string> writeFile(const std::string& name, std::string_view text);
  void announce(const KiteReport& report);

  const Dependencies dependencies_;
  BackgroundWork work_{"kite-drafts"};  // last: its tasks use the others
};

}  // namespace tal
