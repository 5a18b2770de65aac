#include "platform/linux/capture/ToolOutput.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::size_t kMostOutputBytes = std::size_t{8} << 20;

/// The child's standard output is the pipe; it has no other.
std::optional<pid_t> spawn(const std::vector<std::string>& command, int output) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
  posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  std::vector<char*> arguments;
  arguments.reserve(command.size() + 1);
  for (const std::string& argument : command) arguments.push_back(const_cast<char*>(argument.c_str()));
  arguments.push_back(nullptr);
  pid_t child = 0;
  const int error = ::posix_spawnp(&child, arguments[0], &actions, nullptr, arguments.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) return std::nullopt;
  return child;
}

int millisecondsUntil(SteadyClock::time_point deadline) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - SteadyClock::now()).count();
  return left > 0 ? static_cast<int>(left) : 0;
}

/// One that has closed its output need not have ended.
bool endsBefore(pid_t child, SteadyClock::time_point deadline) {
  const FileDescriptor process(static_cast<int>(::syscall(SYS_pidfd_open, child, 0)));
  pollfd wait{process.get(), POLLIN, 0};
  int ready = -1;
  do {
    ready = ::poll(&wait, 1, millisecondsUntil(deadline));
  } while (ready < 0 && errno == EINTR);
  return ready > 0;
}

/// Until the end; false when the time is over, or there is more than anybody wants.
bool readAll(int input, SteadyClock::time_point deadline, std::string& out) {
  std::array<char, 65536> bytes{};
  while (out.size() < kMostOutputBytes) {
    pollfd wait{input, POLLIN, 0};
    const int ready = ::poll(&wait, 1, millisecondsUntil(deadline));
    if (ready < 0 && errno == EINTR) continue;
    if (ready <= 0) return false;
    const ssize_t got = ::read(input, bytes.data(), bytes.size());
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got == 0;
    out.append(bytes.data(), static_cast<std::size_t>(got));
  }
  return false;
}

}  // namespace

std::optional<std::string> toolOutput(const std::vector<std::string>& command,
                                      std::chrono::milliseconds at_most) {
  std::array<int, 2> ends{};
  if (::pipe2(ends.data(), O_CLOEXEC) != 0) return std::nullopt;
  const FileDescriptor input(ends[0]);
  FileDescriptor output(ends[1]);
  const auto child = spawn(command, output.get());
  output = FileDescriptor();
  if (!child) return std::nullopt;
  std::string text;
  const auto deadline = SteadyClock::now() + at_most;
  const bool whole = readAll(input.get(), deadline, text) && endsBefore(*child, deadline);
  if (!whole) ::kill(*child, SIGKILL);
  int status = 0;
  while (::waitpid(*child, &status, 0) < 0 && errno == EINTR) {
  }
  if (!whole || !WIFEXITED(status) || WEXITSTATUS(status) != 0) return std::nullopt;
  return text;
}

}  // namespace tal
