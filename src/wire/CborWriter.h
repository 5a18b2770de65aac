#pragma once

// Appends CBOR items, in their shortest forms, to one growing buffer, and closes
// them into frames.

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "core/MessageValue.h"

namespace tal {

/// Writes items one after the other. Lengths are known before what they count:
/// nothing indefinite is written. Borrows the buffer.
class CborWriter {
 public:
  explicit CborWriter(std::string& out) : out_(out) {}

  void unsignedInteger(std::uint64_t value) { head(kUnsigned, value); }
  void signedInteger(std::int64_t value);
  void bytes(std::string_view value);
  /// `value` is UTF-8.
  void text(std::string_view value);
  /// `count` items follow.
  void array(std::size_t count) { head(kArray, count); }
  /// `count` pairs follow.
  void map(std::size_t count) { head(kMap, count); }
  void boolean(bool value) { out_ += value ? '\xF5' : '\xF4'; }
  void null() { out_ += '\xF6'; }
  /// The shortest of half, single and double precision that keeps the value.
  void real(double value);
  /// Tag 1; whole seconds as an integer.
  void date(MessageDate value);
  /// Any value, nested ones included. Nesting is the caller's to bound.
  void value(const MessageValue& value);
  void dict(const MessageDict& value);

  /// Begins a frame; `endFrame` with the returned position fills in its length.
  std::size_t beginFrame();
  void endFrame(std::size_t begin);

 private:
  enum Major : std::uint8_t {
    kUnsigned = 0x00,
    kNegative = 0x20,
    kBytes = 0x40,
    kText = 0x60,
    kArray = 0x80,
    kMap = 0xA0,
    kTag = 0xC0,
    kSimple = 0xE0,
  };

  void head(Major major, std::uint64_t argument);
  void bigEndian(std::uint64_t value, unsigned byte_count);

  std::string& out_;
};

}  // namespace tal
