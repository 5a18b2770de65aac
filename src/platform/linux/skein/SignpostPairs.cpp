#include "platform/linux/skein/SignpostPairs.h"

namespace tal {

namespace {

struct Place {
  std::uint64_t thread;
  std::uint64_t signpost;
  friend bool operator==(const Place&, const Place&) = default;
};
struct PlaceHash {
  std::size_t operator()(const Place& place) const {
    constexpr std::uint64_t kSpread = 0x9E3779B97F4A7C15ULL;
    return static_cast<std::size_t>((place.thread * kSpread ^ place.signpost) * kSpread);
  }
};

std::uint64_t joined(std::uint32_t high, std::uint32_t low) {
  constexpr unsigned kHalf = 32;
  return static_cast<std::uint64_t>(high) << kHalf | low;
}

Place placeOf(const TraceEvent& event) {
  return {joined(static_cast<std::uint32_t>(event.process_identifier),
                 static_cast<std::uint32_t>(event.thread_identifier)),
          joined(event.subsystem, event.name)};
}

}  // namespace

SignpostPairs::SignpostPairs(const TraceContent& trace) {
  std::unordered_map<Place, std::vector<std::int64_t>, PlaceHash> open;
  for (const TraceEvent& event : trace.events()) {
    if (event.kind == TraceEvent::Kind::kSignpostBegin) {
      open[placeOf(event)].push_back(event.nanoseconds);
    } else if (event.kind == TraceEvent::Kind::kSignpostEnd) {
      const auto found = open.find(placeOf(event));
      if (found == open.end() || found->second.empty()) {
        ++unpaired_;
        continue;
      }
      const std::int64_t begin = found->second.back();
      found->second.pop_back();
      signposts_.push_back({.subsystem = trace.text(event.subsystem),
                            .name = trace.text(event.name),
                            .milliseconds = millisecondsBetween(begin, event.nanoseconds)});
    }
  }
  for (const auto& [place, begins] : open) unpaired_ += begins.size();
}

}  // namespace tal
