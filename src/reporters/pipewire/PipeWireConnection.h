// One connection to a PipeWire: tells a StreamReporter what its registry, nodes and profiler say.
#pragma once

#include <pipewire/pipewire.h>

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "reporters/pipewire/AudioGraph.h"
#include "reporters/pipewire/Instant.h"
#include "reporters/pipewire/StreamReporter.h"

namespace tal {

class BoundNode;
class BoundClient;
class BoundProfiler;

/// Follows one PipeWire until that is gone.
///
/// What PipeWire tells comes in bursts: a stream that begins is a node, its parameters, its
/// client, its links and a change of state, in no fixed order. So nothing is reported at once;
/// after the first event of a burst the connection asks PipeWire for a sign (a sync), and reports
/// when a sign has come after which nothing was new, or after kMaxRounds signs.
///
/// Lives on the main loop's thread. The context and the reporter outlive it.
class PipeWireConnection {
 public:
  /// Rounds to wait for a burst to end before reporting in the middle of it.
  static constexpr int kMaxRounds = 8;

  struct Callbacks {
    /// PipeWire has answered.
    std::function<void(const std::string& nameAndVersion)> onReady;
    /// PipeWire is gone. The connection may not be destroyed from within this.
    std::function<void()> onLost;
  };

  /// Null when nothing answers at the remote.
  static std::unique_ptr<PipeWireConnection> open(pw_context* context, StreamReporter& reporter,
                                                  Callbacks callbacks);
  /// Closes the reports of all streams.
  ~PipeWireConnection();
  PipeWireConnection(const PipeWireConnection&) = delete;
  PipeWireConnection& operator=(const PipeWireConnection&) = delete;

  /// For the bound objects: something about the graph is new.
  void changed();
  /// For the bound objects: the stream belongs to this client, which is to be asked for its names.
  void wantClient(ObjectID client);

  StreamReporter& reporter() { return reporter_; }
  pw_registry* registry() { return registry_; }

 private:
  PipeWireConnection(pw_core* core, StreamReporter& reporter, Callbacks callbacks);

  void global(ObjectID id, const char* type, std::uint32_t version, const spa_dict* properties);
  void globalRemoved(ObjectID id);
  void done(int sequence);
  void askForSign();
  void settle();

  static pw_core_events coreEvents();
  static pw_registry_events registryEvents();

  pw_core* core_;
  StreamReporter& reporter_;
  Callbacks callbacks_;
  pw_registry* registry_;
  spa_hook coreHook_{};
  spa_hook registryHook_{};

  std::map<ObjectID, std::unique_ptr<BoundNode>> nodes_;
  std::map<ObjectID, std::unique_ptr<BoundClient>> clients_;
  std::optional<ObjectID> profilerID_;
  std::unique_ptr<BoundProfiler> profiler_;

  /// When the burst began that has not been reported yet.
  std::optional<Instant> burstBegan_;
  /// Something was new since the sign was asked for.
  bool changedSinceSign_ = false;
  int rounds_ = 0;
  std::optional<int> awaitedSign_;
};

}  // namespace tal
