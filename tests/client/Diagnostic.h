// CBOR as readable text, decoded by libcbor's own tree builder, so that the library under test cannot vouch
// for itself.
#pragma once

#include <cstdint>
#include <span>
#include <string>

namespace tal::test {

/// Diagnostic notation: {"a": 1, "b": [-2, 0.5, true, null, h'00ff', 1(0.25)]}. "malformed" where it does not
/// decode whole.
std::string diagnostic(std::span<const unsigned char> bytes);

/// The CBOR of texts of up to 255 bytes, and of numbers.
std::string cborText(const std::string& text);
std::string cborUint16(std::uint16_t number);

}  // namespace tal::test
