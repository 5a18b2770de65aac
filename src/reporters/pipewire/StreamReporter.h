// Brings the picture of the audio graph and the reporting sessions together: one session per stream.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <vector>

#include "reporters/pipewire/AudioGraph.h"
#include "reporters/pipewire/Instant.h"
#include "reporters/pipewire/ReportingChannel.h"
#include "reporters/pipewire/StreamSession.h"

namespace tal {

/// How one node fared in one turn of the graph.
struct NodeCycle {
  ObjectID node = 0;
  /// It was woken and had not finished when the next turn began.
  bool late = false;
};

/// One turn of the graph under one driver.
struct GraphCycle {
  ObjectID driver = 0;
  std::chrono::steady_clock::time_point when;
  std::uint64_t frames = 0;
  /// In Hz; 0 when not known.
  std::uint32_t rate = 0;
  /// Xruns of the driver since it began; wraps around.
  std::uint32_t driverXruns = 0;
  std::vector<NodeCycle> followers;
};

/// Reports every stream of an audio graph.
///
/// The PipeWire layer writes into graph() as it is told, and calls settle() once what belongs
/// together has arrived. A removed object is reported at once instead, since its identifier may
/// name another object before the next settle().
///
/// Lives on the main loop's thread. The channel outlives it.
class StreamReporter {
 public:
  explicit StreamReporter(ReportingChannel& channel);

  AudioGraph& graph() { return graph_; }

  /// Reports new streams and what changed about known ones, as having happened at `now`.
  void settle(Instant now);

  /// Takes the object out of the graph. The report of a stream that goes is closed.
  void removeObject(ObjectID id, Instant now);

  /// Closes all reports: the graph is gone, or the reporter ends.
  void closeAll(Instant now);

  void addCycle(const GraphCycle& cycle, Instant now);

  /// The daemon is gone, and with it what its sessions were told: queues for the fresh ones
  /// that every running stream runs.
  void repeatStarts();

  /// True while some stream runs: only then xruns are of interest.
  bool anythingRuns() const;

 private:
  /// Opens the session if there is none yet.
  StreamSession& sessionOf(ObjectID stream, Instant now);
  bool driverHadXrun(const GraphCycle& cycle);

  ReportingChannel& channel_;
  AudioGraph graph_;
  std::map<ObjectID, std::unique_ptr<StreamSession>> sessions_;
  /// The driver's count of xruns in its last turn.
  std::map<ObjectID, std::uint32_t> driverXruns_;
};

}  // namespace tal
