#include "reporters/pipewire/AudioGraph.h"

#include <cmath>
#include <utility>

namespace tal {

namespace {

/// Volumes are 32-bit factors: without rounding, 0.4 reads as 0.4000000059604645 in every report.
double rounded(double gain) {
  constexpr double kSteps = 1'000'000.0;
  return std::isfinite(gain) ? std::round(gain * kSteps) / kSteps : 0.0;
}

}  // namespace

NodeKind nodeKindOf(std::string_view mediaClass) {
  if (mediaClass == "Stream/Output/Audio") return NodeKind::kPlaybackStream;
  if (mediaClass == "Stream/Input/Audio") return NodeKind::kCaptureStream;
  if (mediaClass.starts_with("Audio/")) return NodeKind::kDevice;
  return NodeKind::kOther;
}

void AudioGraph::addNode(ObjectID id, NodeKind kind, std::string title) {
  Node node;
  node.kind = kind;
  node.title = std::move(title);
  nodes_.insert_or_assign(id, std::move(node));
}

void AudioGraph::describeNode(ObjectID id, NodeDescription description) {
  const auto node = nodes_.find(id);
  if (node == nodes_.end()) return;
  if (!description.title.empty()) node->second.title = description.title;
  node->second.description = std::move(description);
}

void AudioGraph::setNodeRunning(ObjectID id, bool running) {
  if (const auto node = nodes_.find(id); node != nodes_.end()) node->second.running = running;
}

void AudioGraph::setNodeVolume(ObjectID id, NodeVolume volume) {
  if (const auto node = nodes_.find(id); node != nodes_.end()) node->second.volume = std::move(volume);
}

void AudioGraph::setNodeFormat(ObjectID id, std::optional<AudioFormat> format) {
  if (const auto node = nodes_.find(id); node != nodes_.end()) node->second.format = std::move(format);
}

void AudioGraph::setClient(ObjectID id, ApplicationNames names) {
  clients_.insert_or_assign(id, std::move(names));
}

void AudioGraph::addLink(ObjectID id, ObjectID output, ObjectID input) {
  links_.insert_or_assign(id, Link{output, input});
}

void AudioGraph::removeObject(ObjectID id) {
  nodes_.erase(id);
  clients_.erase(id);
  links_.erase(id);
}

void AudioGraph::clear() {
  nodes_.clear();
  clients_.clear();
  links_.clear();
}

std::vector<ObjectID> AudioGraph::describedStreams() const {
  std::vector<ObjectID> streams;
  for (const auto& [id, node] : nodes_) {
    if (isDescribedStream(id)) streams.push_back(id);
  }
  return streams;
}

bool AudioGraph::isDescribedStream(ObjectID id) const {
  const auto node = nodes_.find(id);
  if (node == nodes_.end() || !node->second.description) return false;
  return node->second.kind == NodeKind::kPlaybackStream || node->second.kind == NodeKind::kCaptureStream;
}

StreamDirection AudioGraph::directionOf(ObjectID stream) const {
  return nodes_.at(stream).kind == NodeKind::kPlaybackStream ? StreamDirection::kPlayback
                                                             : StreamDirection::kCapture;
}

ReportedStream AudioGraph::identityOf(ObjectID stream) const {
  const NodeDescription& description = nodes_.at(stream).description.value();
  ApplicationNames client;
  if (description.client) {
    if (const auto found = clients_.find(*description.client); found != clients_.end())
      client = found->second;
  }
  return {serviceTypeForRole(description.mediaRole), applicationNameOf(description.application, client)};
}

StreamFacts AudioGraph::factsOf(ObjectID stream) const {
  const Node& node = nodes_.at(stream);
  StreamFacts facts;
  facts.running = node.running;
  facts.format = node.format;
  facts.gain = gainOf(node.volume);
  if (const Node* device = deviceOf(stream)) {
    facts.device = device->title;
    facts.gain *= gainOf(device->volume);
  }
  facts.gain = rounded(facts.gain);
  return facts;
}

/// A stream may be connected to several nodes. The device of the oldest link is the one that the
/// session manager chose, later ones tap in; a stream that is connected to a stream comes last.
const AudioGraph::Node* AudioGraph::deviceOf(ObjectID stream) const {
  const bool playback = directionOf(stream) == StreamDirection::kPlayback;
  const Node* other = nullptr;
  for (const auto& [id, link] : links_) {
    if ((playback ? link.output : link.input) != stream) continue;
    const auto peer = nodes_.find(playback ? link.input : link.output);
    if (peer == nodes_.end()) continue;
    if (peer->second.kind == NodeKind::kDevice) return &peer->second;
    if (!other) other = &peer->second;
  }
  return other;
}

}  // namespace tal
