// The objects of a PipeWire that the reporter listens to, each freed with its proxy.
#pragma once

#include <pipewire/extensions/profiler.h>
#include <pipewire/pipewire.h>

#include <string>

#include "reporters/pipewire/AudioGraph.h"
#include "reporters/pipewire/StreamRules.h"

namespace tal {

class PipeWireConnection;

/// The title to show for a node: its description, else its nick, else its name.
std::string titleFrom(const spa_dict* properties);
ApplicationNames applicationNamesFrom(const spa_dict* properties);

/// Owns a proxy and one listener on it. A proxy of null stands for an object that could not be bound.
class Proxy {
 public:
  Proxy(PipeWireConnection& connection, ObjectID id, const char* type, std::uint32_t version);
  ~Proxy();
  Proxy(const Proxy&) = delete;
  Proxy& operator=(const Proxy&) = delete;

  void* get() const { return proxy_; }
  spa_hook* hook() { return &hook_; }

 private:
  void* proxy_;
  spa_hook hook_{};
};

/// A stream or a device.
class BoundNode {
 public:
  BoundNode(PipeWireConnection& connection, ObjectID id, NodeKind kind);

 private:
  void info(const pw_node_info& info);
  void parameter(std::uint32_t id, const spa_pod* pod);
  static pw_node_events events();

  PipeWireConnection& connection_;
  const ObjectID id_;
  NodeVolume volume_;
  Proxy proxy_;
};

/// A program that is connected to PipeWire.
class BoundClient {
 public:
  BoundClient(PipeWireConnection& connection, ObjectID id);

 private:
  static pw_client_events events();

  PipeWireConnection& connection_;
  const ObjectID id_;
  Proxy proxy_;
};

/// PipeWire reports every turn of the graph while this exists, and so wakes the reporter.
class BoundProfiler {
 public:
  BoundProfiler(PipeWireConnection& connection, ObjectID id);

 private:
  static pw_profiler_events events();

  PipeWireConnection& connection_;
  Proxy proxy_;
};

}  // namespace tal
