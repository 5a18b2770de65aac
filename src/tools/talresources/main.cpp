// Lists what each process uses of processor and memory, or the kernel's memory
// zones. The daemon runs it for its memory log; people may, too.

#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <string>

#include "tools/talresources/Listing.h"

namespace {

constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

// The daemon serves nobody while it waits for a listing, and the memory of a
// process that hangs in the kernel can take for ever to read.
constexpr unsigned kMostSeconds = 10;

constexpr const char* kColumns =
    "The columns: total, first part, second part, unit (\"none\" for nothing at all).\n"
    "  cpu_time        processor time: in user code, in the kernel\n"
    "  phys_mem        resident memory: anonymous, of files and shared\n"
    "  wired_mem       memory that is never swapped out: locked, pinned\n"
    "  phys_footprint  resident memory by shares: anonymous, of files and shared";

// At once, so that a time-out loses nothing that is known.
void writeOut(std::string_view text) {
  std::fwrite(text.data(), 1, text.size(), stdout);
  std::fflush(stdout);
}

int run(int argument_count, char** arguments) {
  CLI::App app("Lists the resources that each process uses.", "talresources");
  app.footer(kColumns);
  app.set_version_flag("--version", std::string("talresources ") + TAL_VERSION);
  bool zones = false;
  std::string proc = "/proc";
  app.add_flag("--zones", zones, "List the kernel's memory zones instead");
  app.add_option("--proc", proc, "Where the kernel's files are, such as a container's")->type_name("DIR");
  try {
    app.parse(argument_count, arguments);
  } catch (const CLI::ParseError& error) {
    return app.exit(error) == 0 ? 0 : kWrongUsage;
  }
  ::alarm(kMostSeconds);
  if (!zones) {
    tal::listProcesses(proc, writeOut);
    return 0;
  }
  const auto error = tal::listZones(proc, writeOut);
  if (error) std::fprintf(stderr, "talresources: %s\n", error->c_str());
  return error ? kFailed : 0;
}

}  // namespace

int main(int argument_count, char** arguments) {
  try {
    return run(argument_count, arguments);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "talresources: %s\n", error.what());
    return kFailed;
  }
}
