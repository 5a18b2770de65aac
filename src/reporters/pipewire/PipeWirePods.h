// Reads the few parameters of PipeWire that reports are made from out of their wire form.
#pragma once

#include <optional>
#include <vector>

#include "reporters/pipewire/StreamReporter.h"
#include "reporters/pipewire/StreamRules.h"

struct spa_pod;

namespace tal {

/// What a Props parameter says about volume, put over what was known before, since a parameter
/// need not hold every property. Absent when the pod is no Props parameter.
std::optional<NodeVolume> volumeFromProps(const spa_pod* props, const NodeVolume& known);

/// Absent when the pod is no audio format, or not one that is agreed on.
std::optional<AudioFormat> audioFormatFromPod(const spa_pod* pod);

/// The turns of the graph in one report of the profiler. Turns that do not parse are left out.
std::vector<GraphCycle> cyclesFromProfile(const spa_pod* profile);

}  // namespace tal
