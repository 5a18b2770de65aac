#include <iostream>
#include <variant>

#include "daemon/CommandLine.h"
#include "daemon/Daemon.h"
#include "platform/linux/process/StartupError.h"

int main(int argument_count, char** arguments) {
  constexpr int kExitCannotStart = 1;
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
