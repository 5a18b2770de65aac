#pragma once

#include <babeltrace2/babeltrace.h>

#include <optional>
#include <string_view>
#include <unordered_map>

#include "platform/linux/skein/TraceContent.h"

namespace tal {

/// Takes what is kept out of the reading library's events. Where an event's fields
/// lie is looked up once for each class of events.
class EventDecoder {
 public:
  explicit EventDecoder(TraceContent& content) : content_(content), none_(content.textId("")) {}

  void decode(const bt_message* message);

 private:
  using Index = std::optional<std::uint64_t>;
  /// The places of fields within their structures.
  struct Layout {
    TraceEvent::Kind kind = TraceEvent::Kind::kOther;
    TextId event = 0;
    Index name;
    Index subsystem;
    Index process;  // in the payload for a switch, else in the context
    Index process_identifier;
    Index thread_identifier;
  };

  const Layout& layoutOf(const bt_event* event);
  Layout makeLayout(const bt_event* event);
  TextId textAt(const bt_field* structure, Index index);

  TraceContent& content_;
  const TextId none_;
  std::unordered_map<const bt_event_class*, Layout> layouts_;
};

}  // namespace tal
