#pragma once

// Bytes as text for JSON and property lists.

#include <string>
#include <string_view>

namespace tal {

/// Appends the bytes in base64 (RFC 4648, padded), without line breaks.
void appendBase64(std::string& out, std::string_view bytes);

}  // namespace tal
