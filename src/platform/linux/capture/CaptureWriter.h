#pragma once

// Puts one capture together and writes it. Everything slow about a capture is here.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/Log.h"
#include "core/MessageDict.h"
#include "platform/Clock.h"
#include "platform/SettingsStore.h"
#include "platform/SymptomReporterService.h"
#include "platform/linux/capture/CaptureArchive.h"
#include "platform/linux/logging/LogRing.h"

namespace tal {

/// What one capture is to hold.
struct CaptureOrder {
  std::string identifier = {};  ///< its name in the archive
  std::string kind = {};        ///< "snapshot", "timed" or "AudioOverloads"
  double requested_at = 0;
  MessageDict signature = {};
  std::optional<MessageDict> payload = std::nullopt;
  /// The session that it is about; absent where nobody told.
  std::shared_ptr<const SymptomContext> context = nullptr;
  /// To look at: those that the payload names, else the daemon and its clients.
  std::vector<std::int32_t> process_identifiers = {};
  bool with_scheduler = false;
};

/// Lives on the queue for slow work.
class CaptureWriter {
 public:
  struct Dependencies {
    std::filesystem::path log_directory;
    std::filesystem::path state_directory;
    const Clock& clock;
    const SettingsStore& settings;
    const LogRing& log_ring;
    const LogChannel& log;
  };

  /// What the dependencies refer to outlives the writer.
  explicit CaptureWriter(Dependencies dependencies);

  /// Clears away what an earlier process left unfinished.
  void tidy() const;

  /// Takes and writes the capture, and keeps all captures within their size. On
  /// failure nothing of it is left, and the reason is logged and answered.
  std::error_code write(const CaptureOrder& order) const;

  /// Keeps the throttle's text for the next start.
  void keepThrottle(const std::string& text) const;
  /// As it was kept, else empty.
  std::string keptThrottle() const;

 private:
  std::string signatureFile(const CaptureOrder& order) const;
  std::filesystem::path throttlePath() const { return dependencies_.state_directory / "capture-throttle"; }

  const Dependencies dependencies_;
  const CaptureArchive archive_;
};

}  // namespace tal
