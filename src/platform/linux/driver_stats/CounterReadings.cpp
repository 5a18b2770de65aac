#include "platform/linux/driver_stats/CounterReadings.h"

#include <algorithm>
#include <limits>

#include "platform/linux/driver_stats/CounterDelta.h"
#include "platform/linux/driver_stats/TextLines.h"

namespace tal {

namespace {

using Words = std::vector<std::string_view>;

// Far more than a driver has states or buckets: a longer file is not what it is taken for.
constexpr std::size_t kMostLines = 1024;

// The words of each line that says something; none of a file with too many.
std::vector<Words> linesOf(std::string_view text) {
  std::vector<Words> lines;
  while (!text.empty()) {
    Words words = wordsOf(takeLine(text));
    if (!words.empty() && words.front().front() != '#') lines.push_back(std::move(words));
    if (lines.size() > kMostLines) return {};
  }
  return lines;
}

std::optional<std::uint64_t> countOf(std::string_view word, std::uint64_t largest) {
  const auto number = numberOf<std::uint64_t>(word);
  return number && *number <= largest ? number : std::nullopt;
}

std::int64_t asSigned(std::uint64_t number) {
  constexpr auto kMost = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  return static_cast<std::int64_t>(std::min(number, kMost));
}

const StateReading::State* sameIn(const StateReading& reading, const StateReading::State& wanted) {
  const auto found = std::find_if(reading.states.begin(), reading.states.end(),
                                  [&](const auto& state) { return state.name == wanted.name; });
  return found == reading.states.end() ? nullptr : &*found;
}

const HistogramReading::Bucket* sameIn(const HistogramReading& reading,
                                       const HistogramReading::Bucket& wanted) {
  const auto found = std::find_if(reading.buckets.begin(), reading.buckets.end(), [&](const auto& bucket) {
    return bucket.lower == wanted.lower && bucket.upper == wanted.upper;
  });
  return found == reading.buckets.end() ? nullptr : &*found;
}

// One number that was set back tells of all that are in the same file.
bool wasSetBack(const StateReading& before, const StateReading& after) {
  return std::any_of(after.states.begin(), after.states.end(), [&](const StateReading::State& state) {
    const auto* earlier = sameIn(before, state);
    return earlier && (counterRestarted(earlier->transitions, state.transitions, after.largest) ||
                       counterRestarted(earlier->residency, state.residency, after.largest));
  });
}

bool wasSetBack(const HistogramReading& before, const HistogramReading& after) {
  return std::any_of(after.buckets.begin(), after.buckets.end(), [&](const HistogramReading::Bucket& bucket) {
    const auto* earlier = sameIn(before, bucket);
    return earlier && counterRestarted(earlier->hits, bucket.hits, after.largest);
  });
}

// The numbers of the bounds of buckets that were hit, where the driver has none.
void fillExtremes(const HistogramReading& reading, DriverStatsChannel& channel) {
  bool first = true;
  for (const DriverStatsBucket& bucket : channel.buckets) {
    if (bucket.hits == 0) continue;
    channel.minimum = first ? bucket.lower : std::min(channel.minimum, bucket.lower);
    channel.maximum = first ? bucket.upper : std::max(channel.maximum, bucket.upper);
    first = false;
  }
  channel.minimum = reading.minimum.value_or(channel.minimum);
  channel.maximum = reading.maximum.value_or(channel.maximum);
}

}  // namespace

std::optional<SimpleReading> parseSimple(std::string_view text, unsigned bits) {
  const auto lines = linesOf(text);
  const std::uint64_t largest = largestOfBits(bits);
  if (lines.size() != 1 || lines[0].size() != 1) return std::nullopt;
  const auto value = countOf(lines[0][0], largest);
  if (!value) return std::nullopt;
  return SimpleReading{*value, largest};
}

std::optional<StateReading> parseStates(std::string_view text, unsigned bits) {
  StateReading reading{.largest = largestOfBits(bits)};
  for (const Words& words : linesOf(text)) {
    if (words.size() != 3) return std::nullopt;
    const auto transitions = countOf(words[1], reading.largest);
    const auto residency = countOf(words[2], reading.largest);
    if (!transitions || !residency) return std::nullopt;
    reading.states.push_back({std::string(words[0]), *transitions, *residency});
  }
  if (reading.states.empty()) return std::nullopt;
  return reading;
}

std::optional<HistogramReading> parseHistogram(std::string_view text, unsigned bits) {
  HistogramReading reading{.largest = largestOfBits(bits)};
  for (const Words& words : linesOf(text)) {
    if (words.size() == 2 && (words[0] == "min" || words[0] == "max")) {
      const auto number = numberOf<std::int64_t>(words[1]);
      if (!number) return std::nullopt;
      (words[0] == "min" ? reading.minimum : reading.maximum) = number;
      continue;
    }
    if (words.size() != 3) return std::nullopt;
    const auto lower = numberOf<std::int64_t>(words[0]);
    const auto upper = numberOf<std::int64_t>(words[1]);
    const auto hits = countOf(words[2], reading.largest);
    if (!lower || !upper || !hits) return std::nullopt;
    reading.buckets.push_back({*lower, *upper, *hits});
  }
  if (reading.buckets.empty()) return std::nullopt;
  return reading;
}

void fillDelta(const SimpleReading& before, const SimpleReading& after, DriverStatsChannel& channel) {
  channel.integer_value = asSigned(counterDelta(before.value, after.value, after.largest));
}

void fillDelta(const StateReading& before, const StateReading& after, DriverStatsChannel& channel) {
  const bool set_back = wasSetBack(before, after);
  double sum = 0;
  for (const StateReading::State& state : after.states) {
    const auto* earlier = set_back ? nullptr : sameIn(before, state);
    const auto since = [&](std::uint64_t StateReading::State::*number) {
      return earlier ? counterDelta(earlier->*number, state.*number, after.largest) : state.*number;
    };
    channel.states.push_back({.name = state.name,
                              .in_transition_count = since(&StateReading::State::transitions),
                              .residency = since(&StateReading::State::residency)});
    sum += static_cast<double>(channel.states.back().residency);
  }
  for (DriverStatsState& state : channel.states) {
    if (state.residency != 0) state.duty_cycle = static_cast<double>(state.residency) / sum;
  }
}

void fillDelta(const HistogramReading& before, const HistogramReading& after, DriverStatsChannel& channel) {
  const bool set_back = wasSetBack(before, after);
  for (const HistogramReading::Bucket& bucket : after.buckets) {
    const auto* earlier = set_back ? nullptr : sameIn(before, bucket);
    const std::uint64_t hits =
        earlier ? counterDelta(earlier->hits, bucket.hits, after.largest) : bucket.hits;
    channel.buckets.push_back({.lower = bucket.lower, .upper = bucket.upper, .hits = asSigned(hits)});
  }
  fillExtremes(after, channel);
}

}  // namespace tal
