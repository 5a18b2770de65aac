#include "reporters/pipewire/PipeWireConnector.h"

#include <cerrno>
#include <system_error>
#include <utility>

namespace tal {

PipeWireConnector::PipeWireConnector(Options options)
    : options_(std::move(options)),
      lostEvent_(pw_loop_add_event(
          options_.loop, [](void* self, std::uint64_t) { static_cast<PipeWireConnector*>(self)->lost(); },
          this)),
      retryTimer_(pw_loop_add_timer(
          options_.loop, [](void* self, std::uint64_t) { static_cast<PipeWireConnector*>(self)->attempt(); },
          this)) {
  if (!lostEvent_ || !retryTimer_) throw std::system_error(errno, std::generic_category(), "event source");
}

PipeWireConnector::~PipeWireConnector() {
  unwatch();
  pw_loop_destroy_source(options_.loop, retryTimer_);
  pw_loop_destroy_source(options_.loop, lostEvent_);
}

void PipeWireConnector::start() { attempt(); }

void PipeWireConnector::attempt() {
  if (connection_) return;
  ready_ = false;
  connection_ =
      PipeWireConnection::open(options_.context, options_.reporter,
                               {.onReady =
                                    [this](const std::string& nameAndVersion) {
                                      if (std::exchange(ready_, true)) return;
                                      waitingLogged_ = false;
                                      options_.onLogLine("follows " + nameAndVersion);
                                    },
                                .onLost = [this] { pw_loop_signal_event(options_.loop, lostEvent_); }});
  if (connection_) {
    connectedAt_ = std::chrono::steady_clock::now();
    unwatch();
    return;
  }
  if (!std::exchange(waitingLogged_, true)) {
    options_.onLogLine("waits for PipeWire at " + options_.socketPaths.front().string());
  }
  watch();
  auto pause = pacing_.pauseAfterFailure();
  if (!pause && !watch_) pause = ReconnectPacing::kLongestPause;
  if (pause) retryAfter(*pause);
}

void PipeWireConnector::lost() {
  connection_.reset();
  if (ready_) options_.onLogLine("PipeWire is gone");
  // One that hangs up on us again and again is not to keep us busy.
  if (std::chrono::steady_clock::now() - connectedAt_ >= kLastingConnection) pacing_.startOver();
  watch();
  // Somebody listened there just now, so the watch alone may have nothing to tell.
  retryAfter(pacing_.pauseAfterFailure().value_or(ReconnectPacing::kLongestPause));
}

void PipeWireConnector::watch() {
  if (watch_) return;
  try {
    watch_ = std::make_unique<PathWatch>(options_.socketPaths);
  } catch (const std::system_error&) {
    return;  // The pauses go on instead.
  }
  watchSource_ = pw_loop_add_io(
      options_.loop, watch_->descriptor(), SPA_IO_IN, false,
      [](void* data, int, std::uint32_t) {
        auto* self = static_cast<PipeWireConnector*>(data);
        if (!self->watch_->takeEvents()) return;
        self->pacing_.startOver();
        self->attempt();
      },
      this);
  if (!watchSource_) watch_.reset();
}

void PipeWireConnector::unwatch() {
  if (watchSource_) pw_loop_destroy_source(options_.loop, std::exchange(watchSource_, nullptr));
  watch_.reset();
}

void PipeWireConnector::retryAfter(std::chrono::nanoseconds pause) {
  const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(pause);
  timespec time{};
  time.tv_sec = seconds.count();
  time.tv_nsec = (pause - seconds).count();
  pw_loop_update_timer(options_.loop, retryTimer_, &time, nullptr, false);
}

}  // namespace tal
