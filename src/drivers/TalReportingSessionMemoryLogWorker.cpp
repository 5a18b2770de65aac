#include "drivers/TalReportingSessionMemoryLogWorker.h"

#include <future>
#include <system_error>

#include "drivers/MemoryListing.h"

namespace tal {

namespace {

constexpr std::chrono::seconds kLeastBetweenCaptures{5};

// Lines of a capture are errors, so that they are in every log.
std::string capture(CommandShell& shell, const LogChannel& log, const std::string& command,
                    MemoryListing::Filter filter) {
  TAL_LOG_ERROR(log, kMemoryLogPrefix, " requesting '", command, "'");
  MemoryListing listing(filter);
  if (!shell.run(command, [&listing](std::string_view bytes) { listing.add(bytes); })) {
    TAL_LOG_ERROR(log, kMemoryLogPrefix, " unable to execute '", command, "'");
    return {};
  }
  std::string captured = listing.finish();
  TAL_LOG_ERROR(log, kMemoryLogPrefix, " request ", command, " captured");
  return captured;
}

// Where there is no thread to be had, a capture with nothing in it.
std::future<std::string> startCapture(const Platform& platform, const LogChannel& log,
                                      const std::string& command, MemoryListing::Filter filter) {
  try {
    return std::async(std::launch::async, capture, std::ref(platform.command_shell), std::cref(log),
                      std::cref(command), filter);
  } catch (const std::system_error& error) {
    TAL_LOG_ERROR(log, kMemoryLogPrefix, " thread constructor failed: ", error.what());
    std::promise<std::string> nothing;
    nothing.set_value({});
    return nothing.get_future();
  }
}

}  // namespace

bool MemoryLogRateLimit::take(Clock::Instant now) {
  const std::lock_guard lock(mutex_);
  if (last_capture_ && now - *last_capture_ <= kLeastBetweenCaptures) return false;
  last_capture_ = now;
  return true;
}

std::unique_ptr<TalReportingSessionWorker> TalReportingSessionMemoryLogWorkerClass::initWithSession(
    TalReportingSession& session) {
  if (session.serviceType() != AudioServiceType::kTest && !session.platform().internal_build) return nullptr;
  return std::make_unique<TalReportingSessionMemoryLogWorker>(session, commands_, rate_limit_);
}

bool TalReportingSessionMemoryLogWorker::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (message->type() != AudioEventType::kMemoryLog) return false;
  const Platform& platform = session_.platform();
  if (!rate_limit_.take(platform.clock.monotonic())) return false;
  // Both run while the first is waited for.
  auto zones = startCapture(platform, log(), commands_.zone_listing, MemoryListing::Filter::kEveryLine);
  auto processes =
      startCapture(platform, log(), commands_.process_listing, MemoryListing::Filter::kProcessResources);
  writeInBlocks(zones.get());
  writeInBlocks(processes.get());
  return false;
}

void TalReportingSessionMemoryLogWorker::writeInBlocks(std::string_view captured) const {
  forEachLogBlock(captured, [this](std::size_t number, std::string_view block) {
    TAL_LOG_ERROR(log(), "WIRED LOG BLOCK ", number, '\n', block);
  });
}

}  // namespace tal
