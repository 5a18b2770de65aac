#include "platform/linux/driver_stats/InterruptReading.h"

#include <string>

#include "platform/linux/driver_stats/CounterDelta.h"
#include "platform/linux/driver_stats/TextLines.h"

namespace tal {

namespace {

constexpr unsigned kCountBits = 32;

// "           CPU0       CPU2": those that are online.
std::vector<std::uint32_t> processorsOf(std::string_view line) {
  constexpr std::string_view kPrefix = "CPU";
  std::vector<std::uint32_t> processors;
  for (const std::string_view word : wordsOf(line)) {
    if (!word.starts_with(kPrefix)) return {};
    processors.push_back(numberOf<std::uint32_t>(word.substr(kPrefix.size())).value_or(0));
  }
  return processors;
}

// Behind the name of the controller and the line's own, such as "0-edge": both are
// one word, the handlers are the rest. Where the controller prints more words, the
// handlers come with the last of them in front, which harms nothing: only their end
// and their separators are looked at.
std::string_view handlersOf(std::string_view rest) {
  takeWord(rest);
  takeWord(rest);
  const auto begin = rest.find_first_not_of(' ');
  return begin == std::string_view::npos ? std::string_view() : rest.substr(begin);
}

}  // namespace

std::vector<InterruptLine> parseInterrupts(std::string_view text) {
  std::vector<InterruptLine> lines;
  const std::vector<std::uint32_t> processors = processorsOf(takeLine(text));
  while (!text.empty()) {
    std::string_view line = takeLine(text);
    std::string_view name = takeWord(line);
    if (name.empty() || name.back() != ':') continue;
    name.remove_suffix(1);
    const auto number = numberOf<std::uint32_t>(name);
    if (!number) continue;  // "NMI:" and its like
    InterruptLine parsed{.number = *number};
    for (const std::uint32_t processor : processors) {
      if (const auto count = numberOf<std::uint32_t>(takeWord(line))) parsed.counts[processor] = *count;
    }
    parsed.handlers = handlersOf(line);
    lines.push_back(std::move(parsed));
  }
  return lines;
}

std::optional<std::uint64_t> interruptsBetween(const InterruptReading& before,
                                               const InterruptReading& after) {
  std::optional<std::uint64_t> sum;
  for (const auto& [key, count] : after.counts) {
    const auto earlier = before.counts.find(key);
    if (earlier == before.counts.end()) continue;
    sum = sum.value_or(0) + counterDelta(earlier->second, count, largestOfBits(kCountBits));
  }
  return sum;
}

}  // namespace tal
