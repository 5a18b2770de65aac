#include "end_to_end/DaemonUnderTest.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sqlite3.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <vector>

namespace tal::bench {

namespace fs = std::filesystem;

namespace {

constexpr int kPatienceMs = 20'000;

void check(bool holds, const std::string& what) {
  if (!holds) throw std::runtime_error(what + ": " + std::strerror(errno));
}

// Where the daemon tells a service manager that it is ready.
class NotifySocket {
 public:
  explicit NotifySocket(const fs::path& path) : path_(path), socket_(::socket(AF_UNIX, SOCK_DGRAM, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
    check(::bind(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0, path);
  }
  NotifySocket(const NotifySocket&) = delete;
  NotifySocket& operator=(const NotifySocket&) = delete;
  ~NotifySocket() { ::close(socket_); }

  std::string variable() const { return "NOTIFY_SOCKET=" + path_.string(); }
  void waitUntilReady() const {
    pollfd state{.fd = socket_, .events = POLLIN, .revents = 0};
    check(::poll(&state, 1, kPatienceMs) == 1, "the daemon is not ready");
    char message[256];
    check(::recv(socket_, message, sizeof message, 0) > 0, "notification");
  }

 private:
  fs::path path_;
  int socket_;
};

}  // namespace

DaemonUnderTest::DaemonUnderTest(const Options& options) {
  std::string name = fs::temp_directory_path() / "tal-bench-XXXXXX";
  check(::mkdtemp(name.data()) != nullptr, name);
  root_ = name;
  writeSetting("org.vantle.talsys.analytics", "wanted = " + options.wanted + "\n");
  // The measurements are of speed; the quotas are what they are.
  writeSetting("org.vantle.talsys.ipc", "max_kept_mebibytes = 65536\n");
  writeSetting("org.vantle.talsys.store", "max_mebibytes = 65536\n");
  if (options.rtc_store) writeSetting("org.vantle.talsys.rtc", "store = true\n");
  start(options.log_level);
}

DaemonUnderTest::~DaemonUnderTest() {
  if (process_ > 0) {
    ::kill(process_, SIGKILL);
    ::waitpid(process_, nullptr, 0);
  }
  std::error_code ignored;
  fs::remove_all(root_, ignored);
}

void DaemonUnderTest::writeSetting(const std::string& domain, const std::string& text) const {
  const fs::path directory = root_ / "config" / "settings";
  fs::create_directories(directory);
  std::ofstream(directory / (domain + ".toml")) << text;
}

void DaemonUnderTest::start(const std::string& log_level) {
  const NotifySocket notify(root_ / "notify");
  const std::string root = root_;
  std::vector<std::string> texts = {TAL_DAEMON_PATH, "--root", root, "--log-level", log_level};
  std::vector<char*> arguments;
  arguments.reserve(texts.size() + 1);
  for (std::string& text : texts) arguments.push_back(text.data());
  arguments.push_back(nullptr);
  std::string variable = notify.variable();
  char* environment[] = {variable.data(), nullptr};

  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  const auto begin = std::chrono::steady_clock::now();
  const int result = ::posix_spawn(&process_, arguments[0], &actions, nullptr, arguments.data(), environment);
  ::posix_spawn_file_actions_destroy(&actions);
  errno = result;
  check(result == 0, TAL_DAEMON_PATH);
  notify.waitUntilReady();
  start_time_ = std::chrono::steady_clock::now() - begin;
}

void DaemonUnderTest::end() {
  check(::kill(process_, SIGTERM) == 0, "kill");
  int status = 0;
  check(::waitpid(process_, &status, 0) == process_, "waitpid");
  process_ = -1;
  if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) throw std::runtime_error("the daemon ended badly");
}

std::uint64_t DaemonUnderTest::endAndCountEvents(const std::string& name) {
  end();
  return count("SELECT count(*) FROM events WHERE name = ?", name);
}

std::uint64_t DaemonUnderTest::endAndCountRtcMessages(int category) {
  end();
  return count("SELECT count(*) FROM rtc_messages WHERE category = CAST(? AS INTEGER)",
               std::to_string(category));
}

std::uint64_t DaemonUnderTest::count(const std::string& query, const std::string& parameter) const {
  sqlite3* database = nullptr;
  sqlite3_stmt* statement = nullptr;
  sqlite3_open((root_ / "state" / "store.db").c_str(), &database);
  sqlite3_prepare_v2(database, query.c_str(), -1, &statement, nullptr);
  sqlite3_bind_text(statement, 1, parameter.c_str(), -1, SQLITE_TRANSIENT);
  if (sqlite3_step(statement) != SQLITE_ROW) throw std::runtime_error(sqlite3_errmsg(database));
  const auto rows = static_cast<std::uint64_t>(sqlite3_column_int64(statement, 0));
  sqlite3_finalize(statement);
  sqlite3_close(database);
  return rows;
}

std::string DaemonUnderTest::statusField(const fs::path& file, const std::string& name) const {
  std::ifstream status(file);
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(name + ":")) return line.substr(name.size() + 1);
  }
  throw std::runtime_error(file.string() + " has no " + name);
}

std::size_t DaemonUnderTest::residentBytes() const {
  constexpr std::size_t kKibibyte = 1024;
  return std::stoul(statusField("/proc/" + std::to_string(process_) + "/status", "VmRSS")) * kKibibyte;
}

std::uint64_t DaemonUnderTest::voluntarySwitches() const {
  std::uint64_t all = 0;
  for (const auto& task : fs::directory_iterator("/proc/" + std::to_string(process_) + "/task")) {
    all += std::stoul(statusField(task.path() / "status", "voluntary_ctxt_switches"));
  }
  return all;
}

std::chrono::nanoseconds DaemonUnderTest::processorTime() const {
  clockid_t clock = 0;
  timespec time{};
  check(::clock_getcpuclockid(process_, &clock) == 0 && ::clock_gettime(clock, &time) == 0, "processor time");
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

}  // namespace tal::bench
