#include <fcntl.h>
#include <unistd.h>

#include <iostream>
#include <variant>

#include "daemon/CommandLine.h"
#include "daemon/Daemon.h"
#include "platform/linux/process/StartupError.h"

namespace {

// Started without a standard descriptor, the daemon would give its number to the next
// file that it opens, and what is meant for standard error would end up in there.
void occupyStandardDescriptors() {
  int opened = -1;
  do {
    opened = ::open("/dev/null", O_RDWR);
  } while (opened >= 0 && opened <= STDERR_FILENO);
  if (opened >= 0) ::close(opened);
}

}  // namespace

int main(int argument_count, char** arguments) {
  constexpr int kExitCannotStart = 1;
  occupyStandardDescriptors();
  const auto parsed = tal::parseCommandLine(argument_count, arguments, TAL_VERSION);
  if (const auto* status = std::get_if<tal::ExitStatus>(&parsed)) return status->value;
  try {
    tal::Daemon daemon(std::get<tal::DaemonOptions>(parsed), TAL_VERSION);
    daemon.run();
    return 0;
  } catch (const tal::StartupError& error) {
    std::cerr << "talreportingd: " << error.what() << '\n';
    return kExitCannotStart;
  }
}
