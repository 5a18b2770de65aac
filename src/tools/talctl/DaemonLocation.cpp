#include "tools/talctl/DaemonLocation.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "platform/linux/notify/NotifyFiles.h"
#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

namespace fs = std::filesystem;

constexpr const char* kSocketName = "talreporting.sock";
constexpr const char* kProgramName = "talreporting";

std::optional<fs::path> environmentPath(const char* name) {
  const char* value = std::getenv(name);
  if (!value || !*value) return std::nullopt;
  return value;
}

/// $NAME, or `fallback` below the home directory.
std::optional<fs::path> userDirectory(const char* name, const char* fallback) {
  auto base = environmentPath(name);
  if (!base) {
    base = environmentPath("HOME");
    if (!base) return std::nullopt;
    *base /= fallback;
  }
  return *base / kProgramName;
}

DaemonLocation underRoot(const fs::path& root) {
  return {root / "run" / kSocketName, root / "state", root / "config", root / "log"};
}

DaemonLocation systemDaemon() {
  return {fs::path("/run") / kProgramName / kSocketName, fs::path("/var/lib") / kProgramName,
          fs::path("/etc") / kProgramName, fs::path("/var/log") / kProgramName};
}

std::optional<DaemonLocation> userDaemon() {
  const auto runtime = environmentPath("XDG_RUNTIME_DIR");
  if (!runtime) return std::nullopt;
  const auto state = userDirectory("XDG_STATE_HOME", ".local/state");
  return DaemonLocation{*runtime / kProgramName / kSocketName, state,
                        userDirectory("XDG_CONFIG_HOME", ".config"),
                        state ? std::optional(*state / "log") : std::nullopt};
}

/// Whether somebody listens there. One whose queue is full does, too.
bool answers(const fs::path& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const std::string& name = path.native();
  if (name.size() >= sizeof address.sun_path) return false;
  std::memcpy(address.sun_path, name.c_str(), name.size());
  const int descriptor = socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
  if (descriptor < 0) return false;
  const int result = connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address);
  const bool answered = result == 0 || errno == EAGAIN;
  close(descriptor);
  return answered;
}

/// The user's first, as the client library looks for them.
std::vector<DaemonLocation> usualPlaces() {
  std::vector<DaemonLocation> places;
  if (auto user = userDaemon()) places.push_back(std::move(*user));
  places.push_back(systemDaemon());
  return places;
}

DaemonLocation atSocket(const fs::path& socket) {
  for (DaemonLocation& place : usualPlaces()) {
    if (socket == place.socket) return place;
  }
  // The layout that --root makes.
  const fs::path directory = fs::absolute(socket).parent_path();
  if (socket.filename() == kSocketName && directory.filename() == "run" && directory != "/run") {
    return underRoot(directory.parent_path());
  }
  return {socket, std::nullopt, std::nullopt, std::nullopt};
}

fs::path require(const std::optional<fs::path>& directory) {
  if (directory) return *directory;
  throw CommandFailure("a socket alone does not tell where the daemon's files are: use --root");
}

}  // namespace

fs::path DaemonLocation::storePath() const { return require(state_directory) / "store.db"; }

fs::path DaemonLocation::capturesPath() const { return require(log_directory) / "Audio/Captures"; }

fs::path DaemonLocation::notifyDirectory() const {
  require(state_directory);  // else the socket need not stand in the daemon's own runtime directory
  return socket.parent_path() / kNotifyFolder;
}

fs::path DaemonLocation::stateSettingsPath(const std::string& domain) const {
  return require(state_directory) / "settings" / (domain + ".toml");
}

fs::path DaemonLocation::configSettingsPath(const std::string& domain) const {
  return require(config_directory) / "settings" / (domain + ".toml");
}

DaemonLocation locateDaemon(const LocationOptions& options) {
  if (!options.root.empty()) return underRoot(options.root);
  if (!options.socket.empty()) return atSocket(options.socket);
  if (const auto socket = environmentPath("TALREPORTING_SOCKET")) return atSocket(*socket);

  std::vector<DaemonLocation> places = usualPlaces();
  const auto first = [&](auto condition) { return std::find_if(places.begin(), places.end(), condition); };
  auto chosen = first([](const DaemonLocation& place) { return answers(place.socket); });
  if (chosen == places.end()) {
    chosen = first([](const DaemonLocation& place) {
      std::error_code ignored;
      return place.state_directory && fs::exists(place.storePath(), ignored);
    });
  }
  if (chosen != places.end()) return *chosen;
  return geteuid() == 0 ? places.back() : places.front();
}

}  // namespace tal::talctl
