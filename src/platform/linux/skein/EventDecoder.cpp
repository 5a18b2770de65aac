#include "platform/linux/skein/EventDecoder.h"

namespace tal {

namespace {

using Kind = TraceEvent::Kind;

constexpr std::string_view kSignpostBegin = "talreporting:signpost_begin";
constexpr std::string_view kSignpostEnd = "talreporting:signpost_end";
constexpr std::string_view kSwitch = "sched_switch";

std::optional<std::uint64_t> indexOf(const bt_field* structure, std::string_view name) {
  if (!structure) return std::nullopt;
  const bt_field_class* type = bt_field_borrow_class_const(structure);
  const std::uint64_t count = bt_field_class_structure_get_member_count(type);
  for (std::uint64_t i = 0; i < count; ++i) {
    const auto* member = bt_field_class_structure_borrow_member_by_index_const(type, i);
    if (name == bt_field_class_structure_member_get_name(member)) return i;
  }
  return std::nullopt;
}

const bt_field* fieldAt(const bt_field* structure, std::optional<std::uint64_t> index) {
  return structure && index ? bt_field_structure_borrow_member_field_by_index_const(structure, *index)
                            : nullptr;
}

std::int32_t integerAt(const bt_field* structure, std::optional<std::uint64_t> index) {
  const bt_field* field = fieldAt(structure, index);
  if (!field) return 0;
  const bt_field_class_type type = bt_field_get_class_type(field);
  if (bt_field_class_type_is(type, BT_FIELD_CLASS_TYPE_SIGNED_INTEGER)) {
    return static_cast<std::int32_t>(bt_field_integer_signed_get_value(field));
  }
  if (bt_field_class_type_is(type, BT_FIELD_CLASS_TYPE_UNSIGNED_INTEGER)) {
    return static_cast<std::int32_t>(bt_field_integer_unsigned_get_value(field));
  }
  return 0;
}

Kind kindOf(std::string_view event) {
  if (event == kSignpostBegin) return Kind::kSignpostBegin;
  if (event == kSignpostEnd) return Kind::kSignpostEnd;
  return event == kSwitch ? Kind::kSwitch : Kind::kOther;
}

}  // namespace

TextId EventDecoder::textAt(const bt_field* structure, Index index) {
  const bt_field* field = fieldAt(structure, index);
  const bool is_text = field && bt_field_get_class_type(field) == BT_FIELD_CLASS_TYPE_STRING;
  return is_text ? content_.textId({bt_field_string_get_value(field), bt_field_string_get_length(field)})
                 : none_;
}

const EventDecoder::Layout& EventDecoder::layoutOf(const bt_event* event) {
  const bt_event_class* event_class = bt_event_borrow_class_const(event);
  const auto found = layouts_.find(event_class);
  return found != layouts_.end() ? found->second
                                 : layouts_.emplace(event_class, makeLayout(event)).first->second;
}

EventDecoder::Layout EventDecoder::makeLayout(const bt_event* event) {
  const char* name = bt_event_class_get_name(bt_event_borrow_class_const(event));
  const std::string_view text(name ? name : "");
  const bt_field* payload = bt_event_borrow_payload_field_const(event);
  const bt_field* context = bt_event_borrow_common_context_field_const(event);
  Layout layout;
  layout.kind = kindOf(text);
  layout.event = content_.textId(text);
  layout.process_identifier = indexOf(context, "vpid");
  layout.thread_identifier = indexOf(context, "vtid");
  if (layout.kind == Kind::kSwitch) {
    layout.process = indexOf(payload, "prev_comm");
    layout.name = indexOf(payload, "next_comm");
  } else {
    layout.process = indexOf(context, "procname");
    if (layout.kind != Kind::kOther) {
      layout.name = indexOf(payload, "name");
      layout.subsystem = indexOf(payload, "subsystem");
    }
  }
  return layout;
}

void EventDecoder::decode(const bt_message* message) {
  const bt_event* event = bt_message_event_borrow_event_const(message);
  const Layout& layout = layoutOf(event);
  const bt_field* payload = bt_event_borrow_payload_field_const(event);
  const bt_field* context = bt_event_borrow_common_context_field_const(event);
  const bt_stream* stream = bt_event_borrow_stream_const(event);

  TraceEvent decoded{.kind = layout.kind, .event = layout.event};
  // Every trace that the tracer writes has a clock; what has none cannot be ordered either.
  if (bt_stream_class_borrow_default_clock_class_const(bt_stream_borrow_class_const(stream))) {
    bt_clock_snapshot_get_ns_from_origin(bt_message_event_borrow_default_clock_snapshot_const(message),
                                         &decoded.nanoseconds);
  }
  const bool is_switch = layout.kind == Kind::kSwitch;
  decoded.process = textAt(is_switch ? payload : context, layout.process);
  decoded.name = textAt(payload, layout.name);
  decoded.subsystem = textAt(payload, layout.subsystem);
  decoded.process_identifier = integerAt(context, layout.process_identifier);
  decoded.thread_identifier = integerAt(context, layout.thread_identifier);
  // There is one stream for each processor.
  if (is_switch) decoded.processor = static_cast<std::uint32_t>(bt_stream_get_id(stream));
  content_.add(decoded);
}

}  // namespace tal
