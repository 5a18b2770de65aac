#pragma once

#include <string>
#include <string_view>

namespace tal {

/// The nodes in a dump of `pw-dump`, a line each with id, state, class, name and
/// application; says so where the text is no such dump.
std::string pipeWireNodes(std::string_view dump);

}  // namespace tal
