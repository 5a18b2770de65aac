#include "tools/talctl/Terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <system_error>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

// For a terminal that does not tell, such as a serial line.
constexpr std::size_t kCustomaryWidth = 80;

std::string_view environment(const char* name) {
  const char* value = std::getenv(name);
  return value ? value : "";
}

}  // namespace

Terminal Terminal::standardOutput() {
  const bool interactive = isatty(STDOUT_FILENO) == 1;
  return {interactive, interactive && environment("NO_COLOR").empty() && environment("TERM") != "dumb"};
}

Width Terminal::width() const {
  if (!interactive_) return std::nullopt;
  winsize size{};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kCustomaryWidth;
  return size.ws_col;
}

std::string Terminal::styled(Style style, std::string_view text) const {
  if (!colours_) return std::string(text);
  const std::string_view begin = style == Style::kBold ? "\033[1m" : "\033[2m";
  return std::string(begin) + std::string(text) + "\033[0m";
}

void Terminal::write(std::string_view text) const {
  while (!text.empty()) {
    const ssize_t written = ::write(STDOUT_FILENO, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) {
      throw CommandFailure("cannot write to standard output: " + std::generic_category().message(errno));
    }
    text.remove_prefix(static_cast<std::size_t>(written));
  }
}

}  // namespace tal::talctl
