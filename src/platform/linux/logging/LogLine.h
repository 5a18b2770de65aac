#pragma once

// What both log sinks make of a line that may hold text from a client.

#include <string>
#include <string_view>

namespace tal {

/// Appends the text with every control character (C0, DEL, C1) and every byte
/// that is no UTF-8 escaped ("\n", "\t", "\x1b", …), so that no client can forge
/// a line or drive a terminal. Backslashes stay as they are.
void appendEscaped(std::string& out, std::string_view text);

}  // namespace tal
