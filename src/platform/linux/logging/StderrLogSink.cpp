#include "platform/linux/logging/StderrLogSink.h"

#include <pthread.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <ctime>
#include <string>

#include "platform/linux/logging/LogLine.h"

namespace tal {

namespace {

double secondsSince1970() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// Keeps the signal of a broken pipe from ending the process, whatever the
// process has decided about it elsewhere.
class BrokenPipeGuard {
 public:
  BrokenPipeGuard() {
    sigemptyset(&signal_);
    sigaddset(&signal_, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &signal_, &before_);
  }
  BrokenPipeGuard(const BrokenPipeGuard&) = delete;
  BrokenPipeGuard& operator=(const BrokenPipeGuard&) = delete;
  ~BrokenPipeGuard() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

  /// To be called when a write said EPIPE: takes the signal that came with it.
  void takeSignal() {
    const timespec at_once{};
    while (sigtimedwait(&signal_, nullptr, &at_once) < 0 && errno == EINTR) {
    }
  }

 private:
  sigset_t signal_{};
  sigset_t before_{};
};

}  // namespace

void StderrLogSink::write(std::string_view channel, LogLevel level, std::string_view line) {
  std::string text;
  text.reserve(line.size() + 64);
  appendLogLine(text, secondsSince1970(), channel, level, line);
  writeWhole(text);
}

void StderrLogSink::writeWhole(std::string_view text) {
  const std::lock_guard lock(mutex_);
  BrokenPipeGuard guard;
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor_, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      if (errno == EPIPE) guard.takeSignal();
      return;
    }
  }
}

}  // namespace tal
