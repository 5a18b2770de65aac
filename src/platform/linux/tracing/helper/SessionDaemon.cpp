#include "platform/linux/tracing/helper/SessionDaemon.h"

#include <fcntl.h>
#include <lttng/lttng.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <system_error>
#include <thread>

namespace tal {

namespace {

using namespace std::chrono_literals;

constexpr char kProgram[] = "lttng-sessiond";
constexpr int kNotInstalled = 127;
constexpr mode_t kOwnersOnly = 0700;
// Within the 15 seconds that the daemon waits for a trace to start.
constexpr auto kStartPatience = 12s;
constexpr auto kEndPatience = 8s;
constexpr auto kBetweenLooks = 20ms;

std::string reasonOf(int error) { return std::generic_category().message(error); }

// In the child: it ends with this program, however that ends.
[[noreturn]] void becomeSessionDaemon() {
  ::prctl(PR_SET_PDEATHSIG, SIGTERM);
  const int nothing = ::open("/dev/null", O_RDWR);
  for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) ::dup2(nothing, stream);
  ::execlp(kProgram, kProgram, "--no-kernel", static_cast<char*>(nullptr));
  ::_exit(kNotInstalled);
}

}  // namespace

std::string SessionDaemon::ensure(const std::string& private_home) {
  if (lttng_session_daemon_alive() == 1) return "";
  if (::mkdir(private_home.c_str(), kOwnersOnly) != 0 && errno != EEXIST) {
    return private_home + ": " + reasonOf(errno);
  }
  ::setenv("LTTNG_HOME", private_home.c_str(), /*overwrite=*/1);
  const auto deadline = std::chrono::steady_clock::now() + kStartPatience;
  while (std::chrono::steady_clock::now() < deadline) {
    if (own_ < 0) own_ = ::fork();
    if (own_ == 0) becomeSessionDaemon();
    if (own_ < 0) return reasonOf(errno);
    std::this_thread::sleep_for(kBetweenLooks);
    if (lttng_session_daemon_alive() == 1) return "";
    if (hasEnded() == kNotInstalled) return std::string(kProgram) + " is not installed";
  }
  return std::string(kProgram) + " is not ready in time";
}

// One that was ended a moment ago may still hold the lock of the place: then another try is worth while.
int SessionDaemon::hasEnded() {
  int status = 0;
  if (::waitpid(own_, &status, WNOHANG) != own_) return 0;
  own_ = -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : 0;
}

SessionDaemon::~SessionDaemon() {
  if (own_ < 0) return;
  ::kill(own_, SIGTERM);
  const auto deadline = std::chrono::steady_clock::now() + kEndPatience;
  while (::waitpid(own_, nullptr, WNOHANG) == 0) {
    if (std::chrono::steady_clock::now() > deadline) ::kill(own_, SIGKILL);
    std::this_thread::sleep_for(kBetweenLooks);
  }
}

}  // namespace tal
