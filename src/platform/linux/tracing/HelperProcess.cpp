#include "platform/linux/tracing/HelperProcess.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/eventfd.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <system_error>

namespace tal {

namespace {

// How long a helper that was given up may take to tidy up.
constexpr int kPatienceMilliseconds = 10'000;
// The helper's lines are short; more without a line end is nonsense.
constexpr std::size_t kLongestLine = 8192;

std::string reasonOf(int error) { return std::generic_category().message(error); }

struct Pipe {
  FileDescriptor read_end;
  FileDescriptor write_end;
};

Pipe makePipe() {
  std::array<int, 2> ends{-1, -1};
  if (::pipe2(ends.data(), O_CLOEXEC) != 0) return {};
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

// The daemon blocks and ignores signals as suits it; the helper is to have them all.
void setDefaultSignals(posix_spawnattr_t& attributes) {
  sigset_t signals;
  ::sigemptyset(&signals);
  ::posix_spawnattr_setsigmask(&attributes, &signals);
  ::sigaddset(&signals, SIGPIPE);
  ::posix_spawnattr_setsigdefault(&attributes, &signals);
  ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
}

}  // namespace

HelperProcess::HelperProcess() : given_up_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

std::string HelperProcess::spawn(const std::filesystem::path& program,
                                 const std::vector<std::string>& arguments) {
  Pipe to_helper = makePipe();
  Pipe from_helper = makePipe();
  if (!given_up_ || !to_helper.read_end || !from_helper.read_end) return reasonOf(EMFILE);

  std::string name = program.string();
  std::vector<std::string> words = arguments;
  std::vector<char*> pointers{name.data()};
  for (std::string& word : words) pointers.push_back(word.data());
  pointers.push_back(nullptr);

  posix_spawn_file_actions_t actions;
  posix_spawnattr_t attributes;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawnattr_init(&attributes);
  ::posix_spawn_file_actions_adddup2(&actions, to_helper.read_end.get(), STDIN_FILENO);
  ::posix_spawn_file_actions_adddup2(&actions, from_helper.write_end.get(), STDOUT_FILENO);
  // What the tracer's libraries have to say comes as one line of the helper's.
  ::posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  setDefaultSignals(attributes);
  const int error = ::posix_spawn(&process_, name.c_str(), &actions, &attributes, pointers.data(), environ);
  ::posix_spawn_file_actions_destroy(&actions);
  ::posix_spawnattr_destroy(&attributes);
  if (error != 0) {
    process_ = -1;
    return name + ": " + reasonOf(error);
  }
  const std::lock_guard lock(input_mutex_);
  // Given up before it ran, it finds its input at the end.
  if (!was_given_up_) input_ = std::move(to_helper.write_end);
  output_ = std::move(from_helper.read_end);
  return "";
}

HelperProcess::Waited HelperProcess::waitReadable(bool given_up) const {
  std::array<pollfd, 2> watched{pollfd{.fd = output_.get(), .events = POLLIN, .revents = 0},
                                pollfd{.fd = given_up_.get(), .events = POLLIN, .revents = 0}};
  const nfds_t count = given_up ? 1 : 2;
  const int ready = ::poll(watched.data(), count, given_up ? kPatienceMilliseconds : -1);
  if (ready == 0) return Waited::kTimedOut;
  return ready > 0 && watched[0].revents == 0 ? Waited::kGivenUp : Waited::kReadable;
}

void HelperProcess::readLines(const std::function<void(std::string_view line)>& take) {
  std::string pending;
  bool given_up = false;
  for (;;) {
    const Waited waited = waitReadable(given_up);
    if (waited == Waited::kGivenUp) {
      given_up = true;
      continue;
    }
    if (waited == Waited::kTimedOut) return end(/*kill_it=*/true);
    std::array<char, 1024> bytes{};
    const ssize_t size = ::read(output_.get(), bytes.data(), bytes.size());
    if (size < 0 && errno == EINTR) continue;
    if (size <= 0) return end(/*kill_it=*/false);
    pending.append(bytes.data(), static_cast<std::size_t>(size));
    for (auto line_end = pending.find('\n'); line_end != std::string::npos; line_end = pending.find('\n')) {
      take(std::string_view(pending).substr(0, line_end));
      pending.erase(0, line_end + 1);
    }
    if (pending.size() > kLongestLine) return end(/*kill_it=*/true);
  }
}

void HelperProcess::end(bool kill_it) {
  if (process_ < 0) return;
  if (kill_it) ::kill(process_, SIGKILL);
  while (::waitpid(process_, nullptr, 0) < 0 && errno == EINTR) {
  }
  process_ = -1;
}

void HelperProcess::writeLine(std::string_view line) {
  const std::lock_guard lock(input_mutex_);
  const std::string text = std::string(line) + '\n';
  // A helper that has ended is noticed by whoever reads.
  if (input_ && ::write(input_.get(), text.data(), text.size()) < 0) return;
}

void HelperProcess::giveUp() {
  {
    const std::lock_guard lock(input_mutex_);
    input_ = FileDescriptor();
    was_given_up_ = true;
  }
  constexpr std::uint64_t kOne = 1;
  if (::write(given_up_.get(), &kOne, sizeof kOne) < 0) return;
}

}  // namespace tal
