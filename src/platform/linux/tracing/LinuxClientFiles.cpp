#include "platform/linux/tracing/LinuxClientFiles.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <system_error>
#include <utility>

#include "platform/linux/diagnostic_log/BufferedFile.h"
#include "platform/linux/tracing/ClientRights.h"

namespace tal {

namespace {

constexpr mode_t kReadByEveryone = 0644;
constexpr char kNotAbsolute[] = "the path is not absolute, or holds . or ..";
constexpr char kNobody[] = "nothing is known of the client's rights";

std::string reasonOf(int error) { return std::generic_category().message(error); }

class LinuxResultsDirectory final : public ResultsDirectory {
 public:
  /// Without a client: the daemon's own directory.
  LinuxResultsDirectory(FileDescriptor directory, std::unique_ptr<const ClientIdentity> client)
      : directory_(std::move(directory)), client_(std::move(client)) {}

  DiagnosticLog::Opened createFile(std::string_view name) override {
    const std::string file(name);
    if (Error error = checkReplaceable(file)) return {nullptr, *error};
    if (::unlinkat(directory_.get(), file.c_str(), 0) != 0 && errno != ENOENT)
      return {nullptr, reasonOf(errno)};
    FileDescriptor made(::openat(directory_.get(), file.c_str(),
                                 O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kReadByEveryone));
    if (!made) return {nullptr, reasonOf(errno)};
    if (client_) handOver(made.get());
    return {std::make_unique<BufferedFile>(made.release()), ""};
  }

  Error move(std::string_view from, std::string_view to) override {
    const std::string target(to);
    if (Error error = checkReplaceable(target)) return error;
    if (::renameat(directory_.get(), std::string(from).c_str(), directory_.get(), target.c_str()) != 0)
      return reasonOf(errno);
    return std::nullopt;
  }

 private:
  Error checkReplaceable(const std::string& name) const {
    struct stat directory {};
    struct stat file {};
    if (::fstatat(directory_.get(), name.c_str(), &file, AT_SYMLINK_NOFOLLOW) != 0)
      return errno == ENOENT ? std::nullopt : Error(reasonOf(errno));
    if (::fstat(directory_.get(), &directory) != 0) return reasonOf(errno);
    if (client_ && !mayReplace(*client_, directory, file)) return name + " is not the client's to replace";
    return std::nullopt;
  }

  // Best effort: a daemon that is not root cannot give files away, but they can be read by all.
  void handOver(int file) const {
    if (::fchmod(file, kReadByEveryone) != 0 || ::fchown(file, client_->user, client_->group) != 0) return;
  }

  const FileDescriptor directory_;
  const std::unique_ptr<const ClientIdentity> client_;
};

ClientFiles::Contents readAll(int held, std::size_t most_bytes) {
  // What is held cannot be read from; its entry in /proc is the same file, whatever now bears its name.
  const std::string path = "/proc/self/fd/" + std::to_string(held);
  const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!file) return {std::nullopt, reasonOf(errno)};
  std::string bytes(most_bytes + 1, '\0');
  std::size_t size = 0;
  while (size < bytes.size()) {
    const ssize_t count = ::read(file.get(), bytes.data() + size, bytes.size() - size);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return {std::nullopt, reasonOf(errno)};
    if (count == 0) break;
    size += static_cast<std::size_t>(count);
  }
  if (size > most_bytes) return {std::nullopt, "it is over " + std::to_string(most_bytes) + " bytes"};
  bytes.resize(size);
  return {std::move(bytes), ""};
}

}  // namespace

ClientFiles::Contents LinuxClientFiles::read(const ClientIdentity* client, std::string_view path,
                                             std::size_t most_bytes) {
  const auto parts = partsOf(path);
  if (parts.empty()) return {std::nullopt, kNotAbsolute};
  if (!client) return {std::nullopt, kNobody};
  ClientWalk walk(*client);
  for (const std::string& part : parts) {
    if (walk.enter(part) != ClientWalk::Step::kDone) return {std::nullopt, walk.error()};
  }
  if (!S_ISREG(walk.status().st_mode)) return {std::nullopt, "it is no file"};
  if (!walk.may(Right::kRead)) return {std::nullopt, "the client may not read it"};
  return readAll(walk.descriptor(), most_bytes);
}

ClientFiles::OpenedDirectory LinuxClientFiles::openDirectory(const ClientIdentity* client,
                                                             std::string_view path) {
  const auto parts = partsOf(path);
  if (parts.empty()) return {nullptr, kNotAbsolute};
  if (!client) return {nullptr, kNobody};
  ClientWalk walk(*client);
  for (const std::string& part : parts) {
    const auto step = walk.enter(part);
    const bool reached =
        step == ClientWalk::Step::kDone || (step == ClientWalk::Step::kMissing && walk.make(part));
    if (!reached) return {nullptr, walk.error()};
  }
  if (!S_ISDIR(walk.status().st_mode)) return {nullptr, "it is no directory"};
  if (!walk.may(Right::kWrite) || !walk.may(Right::kSearch))
    return {nullptr, "the client may not write to it"};
  return {std::make_unique<LinuxResultsDirectory>(walk.release(), std::make_unique<ClientIdentity>(*client)),
          ""};
}

ClientFiles::OpenedDirectory LinuxClientFiles::openDiagnosticDirectory(std::string_view place) {
  FileDescriptor directory(::open(diagnostic_log_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  for (const auto& part : std::filesystem::path(place)) {
    if (!directory) break;
    directory = FileDescriptor(
        ::openat(directory.get(), part.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  }
  if (!directory) return {nullptr, reasonOf(errno)};
  return {std::make_unique<LinuxResultsDirectory>(std::move(directory), nullptr), ""};
}

}  // namespace tal
