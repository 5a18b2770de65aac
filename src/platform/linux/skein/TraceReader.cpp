#include "platform/linux/skein/TraceReader.h"

#include <babeltrace2/babeltrace.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <system_error>
#include <vector>

#include "platform/linux/skein/EventDecoder.h"

namespace tal {

namespace {

namespace fs = std::filesystem;

// 40 bytes each. A trace beyond that is refused rather than the daemon's memory filled.
constexpr std::uint64_t kMostEvents = 8'000'000;

struct Release {
  void operator()(const bt_plugin* plugin) const { bt_plugin_put_ref(plugin); }
  void operator()(bt_graph* graph) const { bt_graph_put_ref(graph); }
  void operator()(bt_value* value) const { bt_value_put_ref(value); }
};
using Plugin = std::unique_ptr<const bt_plugin, Release>;
using Graph = std::unique_ptr<bt_graph, Release>;
using Value = std::unique_ptr<bt_value, Release>;

/// What the library says of its last failure: the first cause is the root of it.
std::string lastError(const char* otherwise) {
  const bt_error* error = bt_current_thread_take_error();
  if (!error) return otherwise;
  std::string text = otherwise;
  if (bt_error_get_cause_count(error) > 0) {
    text = bt_error_cause_get_message(bt_error_borrow_cause_by_index(error, 0));
  }
  bt_error_release(error);
  std::replace(text.begin(), text.end(), '\n', ' ');
  return text;
}

/// The directories below which a trace's streams and their description lie.
std::vector<std::string> tracesBelow(const std::string& directory) {
  std::vector<std::string> found;
  std::error_code error;
  for (auto entry = fs::recursive_directory_iterator(directory, error);
       !error && entry != fs::recursive_directory_iterator(); entry.increment(error)) {
    if (entry->path().filename() == "metadata") found.push_back(entry->path().parent_path().string());
  }
  std::sort(found.begin(), found.end());
  return found;
}

struct Intake {
  TraceContent& content;
  EventDecoder decoder;
  bt_message_iterator* messages = nullptr;
  bool too_many = false;
};

void takeMessage(const bt_message* message, Intake& intake) {
  const bt_message_type type = bt_message_get_type(message);
  if (type == BT_MESSAGE_TYPE_EVENT) {
    intake.decoder.decode(message);
  } else if (type == BT_MESSAGE_TYPE_DISCARDED_EVENTS) {
    std::uint64_t count = 0;
    const bool known =
        bt_message_discarded_events_get_count(message, &count) == BT_PROPERTY_AVAILABILITY_AVAILABLE;
    intake.content.addDiscarded(known ? count : 1);
  }
}

bt_graph_simple_sink_component_consume_func_status consume(bt_message_iterator* messages, void* data) {
  auto& intake = *static_cast<Intake*>(data);
  bt_message_array_const batch = nullptr;
  std::uint64_t count = 0;
  const auto status = bt_message_iterator_next(messages, &batch, &count);
  if (status != BT_MESSAGE_ITERATOR_NEXT_STATUS_OK) {
    return static_cast<bt_graph_simple_sink_component_consume_func_status>(status);
  }
  for (std::uint64_t i = 0; i < count; ++i) {
    takeMessage(batch[i], intake);
    bt_message_put_ref(batch[i]);
  }
  if (intake.content.eventCount() <= kMostEvents)
    return BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_OK;
  intake.too_many = true;
  return BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_END;
}

/// Sources of all traces -> one order of time -> the intake.
class ReadingGraph {
 public:
  ReadingGraph() : graph_(bt_graph_create(0)), formats_(findPlugin("ctf")), utilities_(findPlugin("utils")) {}

  std::string build(const std::vector<std::string>& traces, Intake& intake) {
    if (!graph_ || !formats_ || !utilities_) return "the plugins of babeltrace2 are not installed";
    const auto* muxer_class =
        bt_plugin_borrow_filter_component_class_by_name_const(utilities_.get(), "muxer");
    if (!muxer_class || bt_graph_add_filter_component(graph_.get(), muxer_class, "muxer", nullptr,
                                                      BT_LOGGING_LEVEL_NONE, &muxer_) != 0) {
      return lastError("no muxer");
    }
    for (const std::string& trace : traces) {
      if (!addTrace(trace)) return lastError("the trace cannot be opened");
    }
    const bt_component_sink* sink = nullptr;
    if (bt_graph_add_simple_sink_component(graph_.get(), "intake", nullptr, consume, nullptr, &intake,
                                           &sink) != 0 ||
        bt_graph_connect_ports(graph_.get(), bt_component_filter_borrow_output_port_by_index_const(muxer_, 0),
                               bt_component_sink_borrow_input_port_by_index_const(sink, 0), nullptr) != 0) {
      return lastError("no sink");
    }
    return "";
  }

  std::string run() {
    const auto status = bt_graph_run(graph_.get());
    return status == BT_GRAPH_RUN_STATUS_OK ? "" : lastError("the trace cannot be read");
  }

 private:
  static Plugin findPlugin(const char* name) {
    const bt_plugin* plugin = nullptr;
    bt_plugin_find(name, BT_TRUE, BT_TRUE, BT_TRUE, BT_TRUE, BT_FALSE, &plugin);
    return Plugin(plugin);
  }

  bool addTrace(const std::string& trace) {
    const auto* source_class = bt_plugin_borrow_source_component_class_by_name_const(formats_.get(), "fs");
    const Value parameters(bt_value_map_create());
    bt_value* inputs = nullptr;
    if (!source_class || !parameters ||
        bt_value_map_insert_empty_array_entry(parameters.get(), "inputs", &inputs) != 0 ||
        bt_value_array_append_string_element(inputs, trace.c_str()) != 0) {
      return false;
    }
    const bt_component_source* source = nullptr;
    if (bt_graph_add_source_component(graph_.get(), source_class, trace.c_str(), parameters.get(),
                                      BT_LOGGING_LEVEL_NONE, &source) != 0) {
      return false;
    }
    const std::uint64_t ports = bt_component_source_get_output_port_count(source);
    for (std::uint64_t i = 0; i < ports; ++i) {
      // The muxer has always one input more than are connected.
      const std::uint64_t last = bt_component_filter_get_input_port_count(muxer_) - 1;
      if (bt_graph_connect_ports(
              graph_.get(), bt_component_source_borrow_output_port_by_index_const(source, i),
              bt_component_filter_borrow_input_port_by_index_const(muxer_, last), nullptr) != 0) {
        return false;
      }
    }
    return true;
  }

  const Graph graph_;
  const Plugin formats_;
  const Plugin utilities_;
  const bt_component_filter* muxer_ = nullptr;
};

}  // namespace

SkeinResult<TraceContent> readTrace(const std::string& directory) {
  const std::vector<std::string> traces = tracesBelow(directory);
  if (traces.empty()) return {nullptr, "no trace lies in " + directory};
  auto content = std::make_unique<TraceContent>();
  Intake intake{.content = *content, .decoder = EventDecoder(*content)};
  ReadingGraph graph;
  std::string error = graph.build(traces, intake);
  if (error.empty()) error = graph.run();
  if (error.empty() && intake.too_many)
    error = "the trace has over " + std::to_string(kMostEvents) + " events";
  if (!error.empty()) return {nullptr, error};
  return {std::move(content), ""};
}

}  // namespace tal
