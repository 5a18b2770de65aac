#pragma once

#include <string>

#include "platform/linux/skein/TraceContent.h"

namespace tal {

/// Reads every trace below the directory, merged by time, into one content.
SkeinResult<TraceContent> readTrace(const std::string& directory);

}  // namespace tal
