#include "platform/linux/process/LinuxProcessTable.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>

namespace tal {

std::optional<std::string> LinuxProcessTable::processName(std::int32_t process_identifier) const {
  // The kernel answers with at most 64 bytes (work threads of its own).
  constexpr std::size_t kLongestName = 64;
  if (process_identifier <= 0) return std::nullopt;
  const std::string path = "/proc/" + std::to_string(process_identifier) + "/comm";
  const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (file < 0) return std::nullopt;
  std::array<char, kLongestName> text{};
  const ssize_t size = ::read(file, text.data(), text.size());
  ::close(file);
  if (size <= 0) return std::nullopt;
  std::string name(text.data(), static_cast<std::size_t>(size));
  if (name.back() == '\n') name.pop_back();
  return name;
}

std::int32_t LinuxProcessTable::ownProcessIdentifier() const { return ::getpid(); }

}  // namespace tal
