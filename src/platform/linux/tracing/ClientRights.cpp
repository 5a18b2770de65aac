#include "platform/linux/tracing/ClientRights.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <system_error>
#include <utility>

namespace tal {

namespace {

constexpr mode_t kOpenToEveryone = 0777;
constexpr int kJustHold = O_PATH | O_NOFOLLOW | O_CLOEXEC;

std::string reasonOf(int error) { return std::generic_category().message(error); }

bool isMember(const ClientIdentity& client, gid_t group) {
  const auto& groups = client.supplementary_groups;
  return client.group == group || std::find(groups.begin(), groups.end(), group) != groups.end();
}

}  // namespace

bool mayDo(const ClientIdentity& client, const struct stat& file, Right right) {
  constexpr unsigned kOwnerShift = 6;
  constexpr unsigned kGroupShift = 3;
  if (client.user == 0) return true;
  unsigned shift = 0;
  if (file.st_uid == client.user) {
    shift = kOwnerShift;
  } else if (isMember(client, file.st_gid)) {
    shift = kGroupShift;
  }
  return ((file.st_mode >> shift) & static_cast<mode_t>(right)) != 0;
}

bool mayReplace(const ClientIdentity& client, const struct stat& directory, const struct stat& file) {
  const bool sticky = (directory.st_mode & S_ISVTX) != 0;
  return !sticky || client.user == 0 || file.st_uid == client.user || directory.st_uid == client.user;
}

std::vector<std::string> partsOf(std::string_view path) {
  if (path.empty() || path.front() != '/' || path.find('\0') != std::string_view::npos) return {};
  std::vector<std::string> parts;
  while (!path.empty()) {
    const std::string_view part = path.substr(0, path.find('/'));
    if (part == "." || part == "..") return {};
    if (!part.empty()) parts.emplace_back(part);
    path.remove_prefix(std::min(part.size() + 1, path.size()));
  }
  return parts;
}

ClientWalk::ClientWalk(const ClientIdentity& client)
    : client_(client), current_(::open("/", kJustHold | O_DIRECTORY)) {
  if (!current_ || ::fstat(current_.get(), &status_) != 0) error_ = reasonOf(errno);
}

ClientWalk::Step ClientWalk::enter(const std::string& name) {
  if (!current_) return Step::kRefused;
  if (!S_ISDIR(status_.st_mode)) {
    error_ = "what holds " + name + " is no directory";
    return Step::kRefused;
  }
  if (!may(Right::kSearch)) {
    error_ = "the client may not look for " + name;
    return Step::kRefused;
  }
  FileDescriptor next(::openat(current_.get(), name.c_str(), kJustHold));
  if (!next && errno == ENOENT) {
    error_ = "there is no " + name;
    return Step::kMissing;
  }
  return take(std::move(next), name) ? Step::kDone : Step::kRefused;
}

bool ClientWalk::make(const std::string& name) {
  if (!may(Right::kWrite)) {
    error_ = "the client may not make " + name;
    return false;
  }
  if (::mkdirat(current_.get(), name.c_str(), kOpenToEveryone) != 0) {
    error_ = reasonOf(errno);
    return false;
  }
  // Once more, since the process's mask has taken its part away; on the very directory, not on its name.
  const FileDescriptor made(
      ::openat(current_.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!made || ::fchmod(made.get(), kOpenToEveryone) != 0) {
    error_ = reasonOf(errno);
    return false;
  }
  return enter(name) == Step::kDone;
}

bool ClientWalk::take(FileDescriptor next, const std::string& name) {
  if (!next || ::fstat(next.get(), &status_) != 0) {
    error_ = reasonOf(errno);
    return false;
  }
  if (S_ISLNK(status_.st_mode)) {
    error_ = name + " is a symbolic link";
    return false;
  }
  current_ = std::move(next);
  return true;
}

}  // namespace tal
