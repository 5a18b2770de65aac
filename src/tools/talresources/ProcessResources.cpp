#include "tools/talresources/ProcessResources.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <memory>
#include <utility>

namespace tal {

namespace {

// Each of the files that are read is well below this; what is longer is cut.
constexpr std::size_t kBufferBytes = std::size_t{16} << 10;
constexpr std::uint64_t kKernelThread = 0x00200000;  // of a process's flags
constexpr char kZombie = 'Z';
constexpr std::uint64_t kMillisecondsPerSecond = 1000;

std::optional<std::uint64_t> number(std::string_view text) {
  std::uint64_t value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return value;
}

std::string_view nextWord(std::string_view& text) {
  text.remove_prefix(std::min(text.find_first_not_of(" \t\n"), text.size()));
  const std::string_view word = text.substr(0, text.find_first_of(" \t\n"));
  text.remove_prefix(word.size());
  return word;
}

ResourceAmount sumOf(std::uint64_t first, std::uint64_t second) { return {first + second, first, second}; }

ResourceAmount partsOf(std::uint64_t total, std::uint64_t first) {
  return {total, first, total - std::min(first, total)};
}

std::uint64_t millisecondsOf(std::uint64_t ticks) {
  static const auto ticks_per_second = static_cast<std::uint64_t>(::sysconf(_SC_CLK_TCK));
  return ticks * kMillisecondsPerSecond / ticks_per_second;
}

}  // namespace

ProcessReader::ProcessReader(std::filesystem::path proc) : proc_(std::move(proc)), buffer_(kBufferBytes) {}

std::vector<std::int32_t> ProcessReader::processIdentifiers() const {
  std::vector<std::int32_t> identifiers;
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(::opendir(proc_.c_str()), ::closedir);
  while (const dirent* entry = directory ? ::readdir(directory.get()) : nullptr) {
    if (const auto identifier = number(entry->d_name))
      identifiers.push_back(static_cast<std::int32_t>(*identifier));
  }
  std::sort(identifiers.begin(), identifiers.end());
  return identifiers;
}

std::optional<ProcessResources> ProcessReader::read(std::int32_t process_identifier) {
  if (readFile(process_identifier, "stat") != Outcome::kRead) return std::nullopt;
  auto stat = parseProcessStat(content());
  if (!stat || (stat->flags & kKernelThread) != 0) return std::nullopt;
  if (readFile(process_identifier, "status") != Outcome::kRead) return std::nullopt;
  ProcessResources resources{
      .process_identifier = process_identifier,
      .name = std::move(stat->name),
      .cpu_ms = sumOf(millisecondsOf(stat->user_ticks), millisecondsOf(stat->system_ticks)),
      .phys_kib = partsOf(kibibytesOf(content(), "VmRSS"), kibibytesOf(content(), "RssAnon")),
      .wired_kib = sumOf(kibibytesOf(content(), "VmLck"), kibibytesOf(content(), "VmPin")),
      .footprint_kib = ResourceAmount{}};
  // What has ended and waits for its parent has no memory to ask for.
  if (stat->state != kZombie && !readFootprint(resources)) return std::nullopt;
  return resources;
}

bool ProcessReader::readFootprint(ProcessResources& resources) {
  switch (readFile(resources.process_identifier, "smaps_rollup")) {
    case Outcome::kRead:
      resources.footprint_kib = partsOf(kibibytesOf(content(), "Pss"), kibibytesOf(content(), "Pss_Anon"));
      return true;
    case Outcome::kDenied:
      resources.footprint_kib.reset();
      return true;
    case Outcome::kGone:
      break;
  }
  return false;
}

ProcessReader::Outcome ProcessReader::readFile(std::int32_t process_identifier, const char* name) {
  path_ = proc_.native();
  path_ += '/';
  path_ += std::to_string(process_identifier);
  path_ += '/';
  path_ += name;
  const int file = ::open(path_.c_str(), O_RDONLY | O_CLOEXEC);
  // Such files come whole with one read: each further one would have the kernel make them anew.
  const ssize_t got = file < 0 ? -1 : ::read(file, buffer_.data(), buffer_.size());
  size_ = static_cast<std::size_t>(std::max<ssize_t>(got, 0));
  const bool denied = got < 0 && (errno == EACCES || errno == EPERM);
  if (file >= 0) ::close(file);
  if (got < 0) return denied ? Outcome::kDenied : Outcome::kGone;
  return Outcome::kRead;
}

std::optional<ProcessStat> parseProcessStat(std::string_view text) {
  // The name may hold anything, blanks and parentheses included.
  const std::size_t name_begins = text.find('(');
  const std::size_t name_ends = text.rfind(')');
  if (name_begins == std::string_view::npos || name_ends == std::string_view::npos || name_ends < name_begins)
    return std::nullopt;
  ProcessStat stat{.name = std::string(text.substr(name_begins + 1, name_ends - name_begins - 1))};
  text.remove_prefix(name_ends + 1);
  // Behind the name, from 0: state, …
  constexpr std::size_t kFlags = 6;
  constexpr std::size_t kUserTicks = 11;
  std::array<std::string_view, kUserTicks + 2> words;
  for (auto& word : words) word = nextWord(text);
  const auto flags = number(words[kFlags]);
  const auto user_ticks = number(words[kUserTicks]);
  const auto system_ticks = number(words[kUserTicks + 1]);
  if (words[0].empty() || !flags || !user_ticks || !system_ticks) return std::nullopt;
  stat.state = words[0].front();
  stat.flags = *flags;
  stat.user_ticks = *user_ticks;
  stat.system_ticks = *system_ticks;
  return stat;
}

std::uint64_t kibibytesOf(std::string_view text, std::string_view key) {
  for (std::size_t at = text.find(key); at != std::string_view::npos; at = text.find(key, at + 1)) {
    const bool begins_line = at == 0 || text[at - 1] == '\n';
    std::string_view rest = text.substr(at + key.size());
    if (!begins_line || !rest.starts_with(':')) continue;
    rest.remove_prefix(1);
    return number(nextWord(rest)).value_or(0);
  }
  return 0;
}

}  // namespace tal
