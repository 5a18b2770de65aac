#include "platform/linux/shell/LinuxCommandShell.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <optional>
#include <string_view>
#include <system_error>

namespace tal {

namespace {

constexpr const char* kShell = "/bin/sh";
constexpr std::string_view kDefaultPath = "/usr/local/bin:/usr/bin:/bin";
// What the shell says of a command that it does not find or may not execute.
constexpr int kNotExecutable = 126;
constexpr int kNotFound = 127;
constexpr std::size_t kBufferBytes = std::size_t{16} << 10;

class Pipe {
 public:
  Pipe() {
    if (::pipe2(ends_.data(), O_CLOEXEC) != 0) ends_ = {-1, -1};
  }
  Pipe(const Pipe&) = delete;
  Pipe& operator=(const Pipe&) = delete;
  ~Pipe() {
    closeEnd(ends_[0]);
    closeEnd(ends_[1]);
  }
  bool isOpen() const { return ends_[0] >= 0; }
  int readEnd() const { return ends_[0]; }
  int writeEnd() const { return ends_[1]; }
  void closeWriteEnd() { closeEnd(ends_[1]); }

 private:
  static void closeEnd(int& end) {
    if (end >= 0) ::close(end);
    end = -1;
  }
  std::array<int, 2> ends_{-1, -1};
};

// Null-terminated, as the system wants lists of strings. It writes to none of them.
std::vector<char*> pointersTo(const std::vector<std::string>& strings) {
  std::vector<char*> pointers;
  pointers.reserve(strings.size() + 1);
  for (const std::string& each : strings) pointers.push_back(const_cast<char*>(each.c_str()));
  pointers.push_back(nullptr);
  return pointers;
}

std::optional<pid_t> spawn(const std::string& command_line, const std::vector<std::string>& environment,
                           int standard_output) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_adddup2(&actions, standard_output, STDOUT_FILENO);
  // This process ignores broken pipes; tools expect to end of them.
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  sigset_t defaults;
  sigemptyset(&defaults);
  sigaddset(&defaults, SIGPIPE);
  posix_spawnattr_setsigdefault(&attributes, &defaults);
  sigset_t none;
  sigemptyset(&none);
  posix_spawnattr_setsigmask(&attributes, &none);
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);

  const std::vector<std::string> arguments{"sh", "-c", command_line};
  pid_t process = 0;
  const int error = ::posix_spawn(&process, kShell, &actions, &attributes, pointersTo(arguments).data(),
                                  pointersTo(environment).data());
  posix_spawnattr_destroy(&attributes);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) return std::nullopt;
  return process;
}

void readToTheEnd(int descriptor, const CommandShell::Output& output) {
  std::array<char, kBufferBytes> buffer;
  while (true) {
    const ssize_t got = ::read(descriptor, buffer.data(), buffer.size());
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return;
    output({buffer.data(), static_cast<std::size_t>(got)});
  }
}

int waitFor(pid_t process) {
  int status = 0;
  while (::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return status;
}

}  // namespace

LinuxCommandShell::LinuxCommandShell(const std::filesystem::path& program_directory) {
  constexpr std::string_view kPath = "PATH=";
  std::string path(kDefaultPath);
  for (char** variable = environ; *variable; ++variable) {
    const std::string_view text = *variable;
    if (text.starts_with(kPath)) {
      path = text.substr(kPath.size());
    } else {
      environment_.emplace_back(text);
    }
  }
  if (!program_directory.empty()) path = program_directory.string() + ':' + path;
  environment_.push_back(std::string(kPath) + path);
}

bool LinuxCommandShell::run(const std::string& command_line, const Output& output) {
  Pipe pipe;
  if (!pipe.isOpen()) return false;
  const auto process = spawn(command_line, environment_, pipe.writeEnd());
  pipe.closeWriteEnd();
  if (!process) return false;
  readToTheEnd(pipe.readEnd(), output);
  const int status = waitFor(*process);
  const int code = WIFEXITED(status) ? WEXITSTATUS(status) : 0;
  return code != kNotFound && code != kNotExecutable;
}

std::filesystem::path LinuxCommandShell::ownProgramDirectory() {
  std::error_code ignored;
  return std::filesystem::read_symlink("/proc/self/exe", ignored).parent_path();
}

}  // namespace tal
