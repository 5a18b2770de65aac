#include "platform/linux/kite/LinuxTapToKiteService.h"

#include <sys/utsname.h>

#include <cstdint>
#include <fstream>
#include <iomanip>
#include <random>
#include <sstream>
#include <utility>

namespace tal {

namespace {

// Tells drafts of one second apart, also those of another daemon.
std::string randomIdentifier() {
  constexpr int kDigits = 8;
  std::ostringstream text;
  text << std::hex << std::setw(kDigits) << std::setfill('0') << std::uint32_t{std::random_device{}()};
  return text.str();
}

// PRETTY_NAME="Debian GNU/Linux 12 (bookworm)"
std::string operatingSystemName() {
  constexpr std::string_view kKey = "PRETTY_NAME=";
  std::ifstream file("/etc/os-release");
  for (std::string line; std::getline(file, line);) {
    if (!line.starts_with(kKey)) continue;
    line.erase(0, kKey.size());
    std::erase(line, '"');
    return line;
  }
  return "Linux";
}

std::string describeSystem() {
  utsname kernel{};
  if (::uname(&kernel) != 0) return operatingSystemName();
  return operatingSystemName() + ", " + kernel.sysname + ' ' + kernel.release + ' ' + kernel.machine;
}

}  // namespace

void LinuxTapToKiteService::createDraft(KiteDraft draft, std::optional<std::string> process_name,
                                        std::string display_reason, Completion completion) {
  KiteReport report{.draft = std::move(draft),
                    .process_name = std::move(process_name),
                    .display_reason = std::move(display_reason),
                    .name = dependencies_.clock.localTimeForFileName() + '-' + randomIdentifier(),
                    .created_at = dependencies_.clock.secondsSince1970(),
                    .system = {},
                    .program = dependencies_.program,
                    .log_directory = dependencies_.diagnostic_log.pathOf("Audio")};
  const bool taken = work_.add([this, report = std::move(report), completion]() mutable {
    report.system = describeSystem();
    const auto error = write(report);
    completion(error);
    if (!error) announce(report);
  });
  if (!taken) completion("too many drafts are being written");
}

std::optional<std::string> LinuxTapToKiteService::write(const KiteReport& report) {
  if (auto error = dependencies_.diagnostic_log.makeDirectory(kDraftsPlace)) return error;
  // Room for the two files to come.
  dependencies_.diagnostic_log.keepLast(kDraftsPlace, 2 * (kMostDrafts - 1));
  if (auto error = writeFile(report.name + ".md", kiteReportAsMarkdown(report))) return error;
  return writeFile(report.name + ".json", kiteReportAsJson(report));
}

std::optional<std::string> LinuxTapToKiteService::writeFile(const std::string& name, std::string_view text) {
  if (auto error = dependencies_.diagnostic_log.putFile(kDraftsPlace, name, text)) {
    return name + ": " + *error;
  }
  return std::nullopt;
}

void LinuxTapToKiteService::announce(const KiteReport& report) {
  const std::string path = dependencies_.diagnostic_log.pathOf(kDraftsPlace) + '/' + report.name + ".md";
  TAL_LOG(dependencies_.log, "a bug report waits to be filed: ", path);
  const auto not_shown = dependencies_.show({.title = report.draft.title,
                                             .body = "You are asked for a bug report because " +
                                                     report.display_reason + ". A draft to paste: " + path});
  if (not_shown) TAL_LOG_INFO(dependencies_.log, "the desktop was not told of the draft: ", *not_shown);
}

}  // namespace tal
