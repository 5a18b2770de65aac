#include "core/Log.h"

namespace tal {

std::string_view logLevelName(LogLevel level) {
  switch (level) {
    case LogLevel::kError:
      return "error";
    case LogLevel::kDefault:
      return "default";
    case LogLevel::kInfo:
      return "info";
    case LogLevel::kDebug:
      return "debug";
  }
  return "default";
}

namespace {
constexpr std::size_t kFileColumns = 25;
constexpr std::size_t kLineColumns = 5;
}  // namespace

std::string LogChannel::sourcePrefix(std::string_view file, int line) {
  if (const auto slash = file.rfind('/'); slash != std::string_view::npos) file.remove_prefix(slash + 1);
  file = file.substr(0, file.find('.'));
  std::string prefix;
  prefix.reserve(256);
  if (file.size() < kFileColumns) prefix.assign(kFileColumns - file.size(), ' ');
  prefix += file;
  prefix += ':';
  const std::string number = std::to_string(line);
  prefix += number;
  if (number.size() < kLineColumns) prefix.append(kLineColumns - number.size(), ' ');
  prefix += ' ';
  return prefix;
}

LogChannels::LogChannels(LogSink* sink, LogLevel most_detailed)
    : client("talrc", sink, most_detailed),
      service("talrs", sink, most_detailed),
      session("talrr", sink, most_detailed),
      callstat("talri", sink, most_detailed),
      driver_utility("talrd", sink, most_detailed),
      trace("talrt", sink, most_detailed),
      energylog("talrp", sink, most_detailed),
      plume("talra", sink, most_detailed),
      hound("talrb", sink, most_detailed),
      summary("talru", sink, most_detailed),
      flutter("talrl", sink, most_detailed),
      audio_registration("talrz", sink, most_detailed) {}

}  // namespace tal
