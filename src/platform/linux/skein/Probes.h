#pragma once

#include <memory>

#include "platform/linux/skein/TraceContent.h"

namespace tal {

/// Measures one probe on the trace, which may be gone afterwards.
///
/// An event's name is its trace point, "provider:event"; a signpost has besides
/// the names "begin:<name>" and "end:<name>". An interval's end closes the oldest
/// open begin of its process.
std::unique_ptr<SkeinProbe> makeProbe(const SkeinProbeDescription& description, const TraceContent& trace);

}  // namespace tal
