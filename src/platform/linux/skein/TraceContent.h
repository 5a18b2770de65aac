#pragma once

// What is kept of a trace: its events in the order of time, each text once.

#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/SkeinTraceModel.h"

namespace tal {

using TextId = std::uint32_t;

struct TraceEvent {
  enum class Kind : std::uint8_t { kOther, kSignpostBegin, kSignpostEnd, kSwitch };

  std::int64_t nanoseconds = 0;
  Kind kind = Kind::kOther;
  TextId event = 0;      ///< the trace point: "provider:event"
  TextId name = 0;       ///< of a signpost; of a switch: the name that comes onto the processor
  TextId subsystem = 0;  ///< of a signpost
  TextId process = 0;    ///< the name of the process; of a switch: the name that goes
  std::int32_t process_identifier = 0;
  std::int32_t thread_identifier = 0;
  std::uint32_t processor = 0;  ///< of a switch
};

/// The model of a trace. Texts stay where they are for as long as it lives.
class TraceContent final : public SkeinTraceModel {
 public:
  TraceContent() = default;
  TraceContent(const TraceContent&) = delete;
  TraceContent& operator=(const TraceContent&) = delete;

  std::uint64_t eventCount() const override { return events_.size(); }
  std::uint64_t discardedEventCount() const override { return discarded_; }

  TextId textId(std::string_view text);
  std::optional<TextId> findText(std::string_view text) const;
  std::string_view text(TextId id) const { return texts_[id]; }

  void add(const TraceEvent& event) { events_.push_back(event); }
  void addDiscarded(std::uint64_t count) { discarded_ += count; }
  const std::vector<TraceEvent>& events() const { return events_; }

 private:
  std::vector<TraceEvent> events_;
  std::uint64_t discarded_ = 0;
  std::deque<std::string> texts_;
  std::unordered_map<std::string_view, TextId> ids_;
};

inline TextId TraceContent::textId(std::string_view text) {
  if (const auto found = ids_.find(text); found != ids_.end()) return found->second;
  const auto id = static_cast<TextId>(texts_.size());
  texts_.emplace_back(text);
  ids_.emplace(texts_.back(), id);
  return id;
}

inline std::optional<TextId> TraceContent::findText(std::string_view text) const {
  const auto found = ids_.find(text);
  return found == ids_.end() ? std::nullopt : std::optional(found->second);
}

inline double millisecondsBetween(std::int64_t from, std::int64_t to) {
  constexpr double kNanosecondsPerMillisecond = 1e6;
  return static_cast<double>(to - from) / kNanosecondsPerMillisecond;
}

}  // namespace tal
