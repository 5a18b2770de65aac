#include "platform/linux/driver_stats/HostFiles.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <system_error>

namespace tal {

namespace fs = std::filesystem;

namespace {

HostFiles::Content failure(int error) { return {"", error}; }

HostFiles::Content readOpened(int file) {
  struct stat status {};
  if (::fstat(file, &status) != 0) return failure(errno);
  if (!S_ISREG(status.st_mode)) return failure(EINVAL);
  HostFiles::Content content;
  std::array<char, 4096> piece{};  // what the kernel prints at once
  while (content.text.size() <= HostFiles::kLargestFileBytes) {
    const ssize_t size = ::read(file, piece.data(), piece.size());
    if (size == 0) return content;
    if (size > 0) {
      content.text.append(piece.data(), static_cast<std::size_t>(size));
    } else if (errno != EINTR) {
      return failure(errno);
    }
  }
  return failure(EFBIG);
}

}  // namespace

fs::path HostFiles::below(std::string_view path) const {
  path.remove_prefix(std::min(path.find_first_not_of('/'), path.size()));
  return root_ / path;
}

HostFiles::Content HostFiles::read(std::string_view path) const {
  const int file = ::open(below(path).c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (file < 0) return failure(errno);
  Content content = readOpened(file);
  ::close(file);
  return content;
}

std::vector<std::string> HostFiles::namesIn(std::string_view path) const {
  std::vector<std::string> names;
  std::error_code error;
  for (fs::directory_iterator entry(below(path), error), end; !error && entry != end;
       entry.increment(error)) {
    names.push_back(entry->path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::string HostFiles::resolved(std::string_view path) const {
  std::error_code error;
  const fs::path root = fs::canonical(root_, error);
  if (error) return "";
  const fs::path target = fs::canonical(below(path), error);
  if (error) return "";
  const fs::path relative = target.lexically_relative(root);
  return relative.empty() || *relative.begin() == ".." ? "" : "/" + relative.string();
}

}  // namespace tal
