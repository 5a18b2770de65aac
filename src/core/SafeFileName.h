#pragma once

#include <string>
#include <string_view>

namespace tal {

/// A client's text made fit to be part of a file name: "/", control characters
/// (C0, DEL, C1) and leading dots become "_"; at most 80 bytes, cut between characters.
std::string safeInFileName(std::string_view text);

}  // namespace tal
