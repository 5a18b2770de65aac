#include "platform/linux/capture/ProcFile.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

std::optional<std::string> readProcFile(int directory, const char* path, std::size_t most_bytes) {
  constexpr std::size_t kStep = 4096;
  const FileDescriptor file(::openat(directory, path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file) return std::nullopt;
  std::string text;
  while (text.size() < most_bytes) {
    const std::size_t before = text.size();
    const std::size_t wanted = std::min(std::max(kStep, before), most_bytes - before);
    text.resize(before + wanted);
    const ssize_t got = ::read(file.get(), text.data() + before, wanted);
    text.resize(before + (got > 0 ? static_cast<std::size_t>(got) : 0));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 && text.empty()) return std::nullopt;
    if (got <= 0) break;
  }
  return text;
}

std::optional<std::string> readProcFile(const std::string& path, std::size_t most_bytes) {
  return readProcFile(AT_FDCWD, path.c_str(), most_bytes);
}

std::string_view procField(std::string_view text, std::string_view key) {
  while (!text.empty()) {
    std::string_view line = takeLine(text);
    if (!line.starts_with(key) || line.substr(key.size(), 1) != ":") continue;
    line.remove_prefix(key.size() + 1);
    line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
    return line;
  }
  return {};
}

std::string_view takeLine(std::string_view& text) {
  const std::string_view line = text.substr(0, text.find('\n'));
  text.remove_prefix(std::min(line.size() + 1, text.size()));
  return line;
}

}  // namespace tal
