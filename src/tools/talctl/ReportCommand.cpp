#include "tools/talctl/ReportCommand.h"

#include <cerrno>
#include <chrono>
#include <fstream>
#include <optional>
#include <system_error>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/Duration.h"
#include "tools/talctl/report/AudioReport.h"
#include "tools/talctl/report/ReportHtml.h"
#include "tools/talctl/report/ReportText.h"

namespace tal::talctl {
namespace {

double seconds(std::chrono::system_clock::time_point time) {
  return std::chrono::duration<double>(time.time_since_epoch()).count();
}

void writeFile(const std::string& path, const std::string& content) {
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << content;
  file.close();
  if (file) return;
  throw CommandFailure("cannot write " + path + ": " + std::generic_category().message(errno));
}

}  // namespace

void runReport(const DaemonLocation& daemon, const ReportOptions& options, const Terminal& terminal) {
  const auto now = std::chrono::system_clock::now();
  std::optional<double> since;
  if (!options.since.empty()) since = seconds(now - parseDuration(options.since));
  const StoreReading reading = readStore(daemon.storePath(), since);
  const AudioReport report = makeReport(reading, since, seconds(now), {});
  if (options.html.empty()) return terminal.write(reportText(report, terminal));
  const std::string page = reportHtml(report);
  if (options.html == "-") return terminal.write(page);
  writeFile(options.html, page);
}

}  // namespace tal::talctl
