// A plain picture of the audio graph, as far as reports need it: fed by the PipeWire layer,
// asked by the reporter.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "reporters/pipewire/StreamRules.h"
#include "reporters/pipewire/StreamSession.h"

namespace tal {

/// The identifier of an object of the graph. PipeWire gives it to another object once this one is gone.
using ObjectID = std::uint32_t;

enum class NodeKind {
  kPlaybackStream,
  kCaptureStream,
  /// A sink or a source, real or virtual: what streams play to and record from.
  kDevice,
  kOther,
};

NodeKind nodeKindOf(std::string_view mediaClass);

/// What a node says about itself.
struct NodeDescription {
  std::string mediaRole;
  /// To be shown to people: the description, else the nick, else the name.
  std::string title;
  ApplicationNames application;
  std::optional<ObjectID> client;
};

/// Holds nodes, clients and links by identifier and answers what is known about a stream.
///
/// Objects may be described in any order and any number of times. Lives on the main loop's thread.
class AudioGraph {
 public:
  /// Another node under an identifier that is taken replaces the old one.
  void addNode(ObjectID id, NodeKind kind, std::string title);
  void describeNode(ObjectID id, NodeDescription description);
  void setNodeRunning(ObjectID id, bool running);
  void setNodeVolume(ObjectID id, NodeVolume volume);
  void setNodeFormat(ObjectID id, std::optional<AudioFormat> format);
  void setClient(ObjectID id, ApplicationNames names);
  /// Audio flows from `output` to `input`. Two nodes may have one link per channel.
  void addLink(ObjectID id, ObjectID output, ObjectID input);
  void removeObject(ObjectID id);
  void clear();

  /// The streams of which enough is known to report them, in the order of their identifiers.
  std::vector<ObjectID> describedStreams() const;

  bool isDescribedStream(ObjectID id) const;

  /// For a stream of describedStreams().
  StreamDirection directionOf(ObjectID stream) const;
  ReportedStream identityOf(ObjectID stream) const;
  StreamFacts factsOf(ObjectID stream) const;

 private:
  struct Node {
    NodeKind kind = NodeKind::kOther;
    std::string title;
    /// Absent until the node has said all of it.
    std::optional<NodeDescription> description;
    bool running = false;
    NodeVolume volume;
    std::optional<AudioFormat> format;
  };
  struct Link {
    ObjectID output = 0;
    ObjectID input = 0;
  };

  const Node* deviceOf(ObjectID stream) const;

  std::map<ObjectID, Node> nodes_;
  std::map<ObjectID, ApplicationNames> clients_;
  std::map<ObjectID, Link> links_;
};

}  // namespace tal
