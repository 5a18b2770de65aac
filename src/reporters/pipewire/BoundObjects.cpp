#include "reporters/pipewire/BoundObjects.h"

#include <charconv>
#include <cstring>
#include <utility>

#include "reporters/pipewire/PipeWireConnection.h"
#include "reporters/pipewire/PipeWirePods.h"

namespace tal {

namespace {

std::string property(const spa_dict* properties, const char* key) {
  const char* value = properties ? spa_dict_lookup(properties, key) : nullptr;
  return value ? validUtf8(value) : std::string();
}

std::optional<ObjectID> objectIDFrom(const std::string& text) {
  ObjectID id = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), id);
  if (text.empty() || error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return id;
}

}  // namespace

std::string titleFrom(const spa_dict* properties) {
  for (const char* key : {PW_KEY_NODE_DESCRIPTION, PW_KEY_NODE_NICK, PW_KEY_NODE_NAME}) {
    if (std::string title = property(properties, key); !title.empty()) return title;
  }
  return {};
}

ApplicationNames applicationNamesFrom(const spa_dict* properties) {
  return {property(properties, PW_KEY_APP_ID), property(properties, PW_KEY_APP_PROCESS_BINARY),
          property(properties, PW_KEY_APP_NAME)};
}

Proxy::Proxy(PipeWireConnection& connection, ObjectID id, const char* type, std::uint32_t version)
    : proxy_(pw_registry_bind(connection.registry(), id, type, version, 0)) {}

Proxy::~Proxy() {
  if (!proxy_) return;
  spa_hook_remove(&hook_);
  pw_proxy_destroy(static_cast<pw_proxy*>(proxy_));
}

BoundNode::BoundNode(PipeWireConnection& connection, ObjectID id, NodeKind kind)
    : connection_(connection), id_(id), proxy_(connection, id, PW_TYPE_INTERFACE_Node, PW_VERSION_NODE) {
  if (!proxy_.get()) return;
  static const pw_node_events kEvents = events();
  auto* node = static_cast<pw_node*>(proxy_.get());
  pw_node_add_listener(node, proxy_.hook(), &kEvents, this);
  // Only a stream's format is the application's; that of a device is PipeWire's own.
  std::uint32_t parameters[] = {SPA_PARAM_Props, SPA_PARAM_Format};
  pw_node_subscribe_params(node, parameters, kind == NodeKind::kDevice ? 1 : 2);
}

void BoundNode::info(const pw_node_info& info) {
  AudioGraph& graph = connection_.reporter().graph();
  if ((info.change_mask & PW_NODE_CHANGE_MASK_PROPS) != 0 && info.props) {
    NodeDescription description;
    description.mediaRole = property(info.props, PW_KEY_MEDIA_ROLE);
    description.title = titleFrom(info.props);
    description.application = applicationNamesFrom(info.props);
    description.client = objectIDFrom(property(info.props, PW_KEY_CLIENT_ID));
    if (description.client) connection_.wantClient(*description.client);
    graph.describeNode(id_, std::move(description));
  }
  if ((info.change_mask & PW_NODE_CHANGE_MASK_STATE) != 0) {
    graph.setNodeRunning(id_, info.state == PW_NODE_STATE_RUNNING);
  }
  connection_.changed();
}

void BoundNode::parameter(std::uint32_t id, const spa_pod* pod) {
  AudioGraph& graph = connection_.reporter().graph();
  if (id == SPA_PARAM_Props) {
    const auto volume = volumeFromProps(pod, volume_);
    if (!volume) return;
    volume_ = *volume;
    graph.setNodeVolume(id_, volume_);
  } else if (id == SPA_PARAM_Format) {
    graph.setNodeFormat(id_, audioFormatFromPod(pod));
  }
  connection_.changed();
}

pw_node_events BoundNode::events() {
  pw_node_events events{};
  events.version = PW_VERSION_NODE_EVENTS;
  events.info = [](void* self, const pw_node_info* info) { static_cast<BoundNode*>(self)->info(*info); };
  events.param = [](void* self, int, std::uint32_t id, std::uint32_t, std::uint32_t, const spa_pod* pod) {
    static_cast<BoundNode*>(self)->parameter(id, pod);
  };
  return events;
}

BoundClient::BoundClient(PipeWireConnection& connection, ObjectID id)
    : connection_(connection), id_(id), proxy_(connection, id, PW_TYPE_INTERFACE_Client, PW_VERSION_CLIENT) {
  if (!proxy_.get()) return;
  static const pw_client_events kEvents = events();
  pw_client_add_listener(static_cast<pw_client*>(proxy_.get()), proxy_.hook(), &kEvents, this);
}

pw_client_events BoundClient::events() {
  pw_client_events events{};
  events.version = PW_VERSION_CLIENT_EVENTS;
  events.info = [](void* data, const pw_client_info* info) {
    auto* self = static_cast<BoundClient*>(data);
    if ((info->change_mask & PW_CLIENT_CHANGE_MASK_PROPS) == 0 || !info->props) return;
    self->connection_.reporter().graph().setClient(self->id_, applicationNamesFrom(info->props));
    self->connection_.changed();
  };
  return events;
}

BoundProfiler::BoundProfiler(PipeWireConnection& connection, ObjectID id)
    : connection_(connection), proxy_(connection, id, PW_TYPE_INTERFACE_Profiler, PW_VERSION_PROFILER) {
  if (!proxy_.get()) return;
  static const pw_profiler_events kEvents = events();
  pw_profiler_add_listener(static_cast<pw_profiler*>(proxy_.get()), proxy_.hook(), &kEvents, this);
}

pw_profiler_events BoundProfiler::events() {
  pw_profiler_events events{};
  events.version = PW_VERSION_PROFILER_EVENTS;
  events.profile = [](void* self, const spa_pod* pod) {
    StreamReporter& reporter = static_cast<BoundProfiler*>(self)->connection_.reporter();
    for (const GraphCycle& cycle : cyclesFromProfile(pod)) reporter.addCycle(cycle, Instant::now());
  };
  return events;
}

}  // namespace tal
