#include "reporters/pipewire/PipeWireConnection.h"

#include <charconv>
#include <cstring>
#include <string_view>
#include <utility>

#include "reporters/pipewire/BoundObjects.h"

namespace tal {

namespace {

std::optional<ObjectID> linkEnd(const spa_dict* properties, const char* key) {
  const char* text = properties ? spa_dict_lookup(properties, key) : nullptr;
  ObjectID id = 0;
  if (!text || std::from_chars(text, text + std::strlen(text), id).ec != std::errc()) return std::nullopt;
  return id;
}

}  // namespace

std::unique_ptr<PipeWireConnection> PipeWireConnection::open(pw_context* context, StreamReporter& reporter,
                                                             Callbacks callbacks) {
  pw_core* core = pw_context_connect(context, nullptr, 0);
  if (!core) return nullptr;
  return std::unique_ptr<PipeWireConnection>(new PipeWireConnection(core, reporter, std::move(callbacks)));
}

PipeWireConnection::PipeWireConnection(pw_core* core, StreamReporter& reporter, Callbacks callbacks)
    : core_(core),
      reporter_(reporter),
      callbacks_(std::move(callbacks)),
      registry_(pw_core_get_registry(core, PW_VERSION_REGISTRY, 0)) {
  static const pw_core_events kCoreEvents = coreEvents();
  static const pw_registry_events kRegistryEvents = registryEvents();
  pw_core_add_listener(core_, &coreHook_, &kCoreEvents, this);
  pw_registry_add_listener(registry_, &registryHook_, &kRegistryEvents, this);
}

PipeWireConnection::~PipeWireConnection() {
  reporter_.closeAll(Instant::now());
  profiler_.reset();
  nodes_.clear();
  clients_.clear();
  spa_hook_remove(&registryHook_);
  spa_hook_remove(&coreHook_);
  pw_proxy_destroy(reinterpret_cast<pw_proxy*>(registry_));
  pw_core_disconnect(core_);
}

void PipeWireConnection::global(ObjectID id, const char* type, std::uint32_t, const spa_dict* properties) {
  const std::string_view kind(type);
  if (kind == PW_TYPE_INTERFACE_Node) {
    const char* mediaClass = properties ? spa_dict_lookup(properties, PW_KEY_MEDIA_CLASS) : nullptr;
    const NodeKind nodeKind = nodeKindOf(mediaClass ? mediaClass : "");
    reporter_.graph().addNode(id, nodeKind, titleFrom(properties));
    if (nodeKind != NodeKind::kOther) nodes_[id] = std::make_unique<BoundNode>(*this, id, nodeKind);
  } else if (kind == PW_TYPE_INTERFACE_Link) {
    const auto output = linkEnd(properties, PW_KEY_LINK_OUTPUT_NODE);
    const auto input = linkEnd(properties, PW_KEY_LINK_INPUT_NODE);
    if (!output || !input) return;
    reporter_.graph().addLink(id, *output, *input);
  } else if (kind == PW_TYPE_INTERFACE_Profiler) {
    profilerID_ = id;
  } else {
    return;
  }
  changed();
}

void PipeWireConnection::globalRemoved(ObjectID id) {
  nodes_.erase(id);
  clients_.erase(id);
  if (profilerID_ == id) {
    profiler_.reset();
    profilerID_.reset();
  }
  reporter_.removeObject(id, Instant::now());
  changed();
}

void PipeWireConnection::wantClient(ObjectID client) {
  auto& bound = clients_[client];
  if (!bound) bound = std::make_unique<BoundClient>(*this, client);
}

void PipeWireConnection::changed() {
  if (!burstBegan_) burstBegan_ = Instant::now();
  changedSinceSign_ = true;
  if (!awaitedSign_) askForSign();
}

void PipeWireConnection::askForSign() {
  changedSinceSign_ = false;
  ++rounds_;
  awaitedSign_ = pw_core_sync(core_, PW_ID_CORE, 0);
}

void PipeWireConnection::done(int sequence) {
  if (sequence != awaitedSign_) return;
  awaitedSign_.reset();
  if (changedSinceSign_ && rounds_ < kMaxRounds) {
    askForSign();
  } else {
    settle();
  }
}

void PipeWireConnection::settle() {
  reporter_.settle(*burstBegan_);
  burstBegan_.reset();
  rounds_ = 0;
  if (!reporter_.anythingRuns()) {
    profiler_.reset();
  } else if (profilerID_ && !profiler_) {
    profiler_ = std::make_unique<BoundProfiler>(*this, *profilerID_);
  }
}

pw_core_events PipeWireConnection::coreEvents() {
  pw_core_events events{};
  events.version = PW_VERSION_CORE_EVENTS;
  events.info = [](void* self, const pw_core_info* info) {
    static_cast<PipeWireConnection*>(self)->callbacks_.onReady(std::string(info->name) + " " + info->version);
  };
  events.done = [](void* self, std::uint32_t id, int sequence) {
    if (id == PW_ID_CORE) static_cast<PipeWireConnection*>(self)->done(sequence);
  };
  events.error = [](void* self, std::uint32_t id, int, int, const char*) {
    // Other errors concern one object, mostly one that vanished while it was being bound.
    if (id == PW_ID_CORE) static_cast<PipeWireConnection*>(self)->callbacks_.onLost();
  };
  return events;
}

pw_registry_events PipeWireConnection::registryEvents() {
  pw_registry_events events{};
  events.version = PW_VERSION_REGISTRY_EVENTS;
  events.global = [](void* self, std::uint32_t id, std::uint32_t, const char* type, std::uint32_t version,
                     const spa_dict* properties) {
    static_cast<PipeWireConnection*>(self)->global(id, type, version, properties);
  };
  events.global_remove = [](void* self, std::uint32_t id) {
    static_cast<PipeWireConnection*>(self)->globalRemoved(id);
  };
  return events;
}

}  // namespace tal
