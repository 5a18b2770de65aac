#include "platform/linux/skein/Probes.h"

#include <algorithm>
#include <map>
#include <utility>

namespace tal {

namespace {

using Kind = TraceEvent::Kind;

constexpr std::string_view kBeginPrefix = "begin:";
constexpr std::string_view kEndPrefix = "end:";

/// An event's name, looked up once.
class EventMatcher {
 public:
  EventMatcher(const TraceContent& trace, std::string_view name)
      : trace_point_(trace.findText(name)),
        begin_(after(trace, name, kBeginPrefix)),
        end_(after(trace, name, kEndPrefix)) {}

  bool matches(const TraceEvent& event) const {
    return (trace_point_ && event.event == *trace_point_) ||
           (begin_ && event.kind == Kind::kSignpostBegin && event.name == *begin_) ||
           (end_ && event.kind == Kind::kSignpostEnd && event.name == *end_);
  }

 private:
  static std::optional<TextId> after(const TraceContent& trace, std::string_view name,
                                     std::string_view prefix) {
    return name.starts_with(prefix) ? trace.findText(name.substr(prefix.size())) : std::nullopt;
  }

  std::optional<TextId> trace_point_;
  std::optional<TextId> begin_;
  std::optional<TextId> end_;
};

class Measured final : public SkeinProbe {
 public:
  explicit Measured(SkeinProbeDescription description) : description_(std::move(description)) {}

  const SkeinProbeDescription& description() const override { return description_; }
  const std::vector<Series>& series() const override { return series_; }
  std::string_view shortcoming() const override { return shortcoming_; }

  void measure(const TraceContent& trace) {
    switch (description_.kind) {
      case SkeinProbeDescription::Kind::kInterval:
        return measureInterval(trace);
      case SkeinProbeDescription::Kind::kCount:
        return measureCount(trace);
      case SkeinProbeDescription::Kind::kCpu:
        return measureCpu(trace);
    }
  }

 private:
  bool isOfProcesses(const TraceContent& trace, const TraceEvent& event) const {
    const auto& names = description_.processes;
    return names.empty() || std::find(names.begin(), names.end(), trace.text(event.process)) != names.end();
  }

  void measureInterval(const TraceContent& trace) {
    const EventMatcher begin(trace, description_.begin);
    const EventMatcher end(trace, description_.end);
    std::map<std::int32_t, std::deque<std::int64_t>> open;
    Series series{.name = description_.name};
    for (const TraceEvent& event : trace.events()) {
      const bool ends = end.matches(event);
      const bool begins = begin.matches(event);
      if ((!ends && !begins) || !isOfProcesses(trace, event)) continue;
      auto& begun = open[event.process_identifier];
      if (ends && !begun.empty()) {
        series.milliseconds.push_back(millisecondsBetween(begun.front(), event.nanoseconds));
        begun.pop_front();
      }
      // One event may be both, as the beat of a clock.
      if (begins) begun.push_back(event.nanoseconds);
    }
    series_.push_back(std::move(series));
  }

  void measureCount(const TraceContent& trace) {
    for (const std::string& name : description_.events) {
      const EventMatcher matcher(trace, name);
      const auto count = std::count_if(trace.events().begin(), trace.events().end(),
                                       [&](const TraceEvent& event) { return matcher.matches(event); });
      series_.push_back({.name = description_.name + ' ' + name, .count = static_cast<std::uint64_t>(count)});
    }
  }

  // A stretch is from one switch to the next on the same processor.
  void measureCpu(const TraceContent& trace) {
    std::map<std::uint32_t, std::int64_t> since;
    for (const std::string& name : description_.processes)
      series_.push_back({.name = description_.name + ' ' + name});
    for (const TraceEvent& event : trace.events()) {
      if (event.kind != Kind::kSwitch) continue;
      const auto begun = since.find(event.processor);
      const auto which =
          std::find(description_.processes.begin(), description_.processes.end(), trace.text(event.process));
      if (begun != since.end() && which != description_.processes.end()) {
        auto& series = series_[static_cast<std::size_t>(which - description_.processes.begin())];
        series.milliseconds.push_back(millisecondsBetween(begun->second, event.nanoseconds));
      }
      since[event.processor] = event.nanoseconds;
    }
    if (since.empty()) shortcoming_ = "the trace has no scheduler events";
  }

  const SkeinProbeDescription description_;
  std::vector<Series> series_;
  std::string shortcoming_;
};

}  // namespace

std::unique_ptr<SkeinProbe> makeProbe(const SkeinProbeDescription& description, const TraceContent& trace) {
  auto probe = std::make_unique<Measured>(description);
  probe->measure(trace);
  return probe;
}

}  // namespace tal
