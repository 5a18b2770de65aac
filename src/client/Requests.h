// How requests are laid out in CBOR.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "client/CborEncode.h"
#include "client/talreporting.h"

namespace tal::clientlib {

/// What a frame can need beside a request's arguments: the length, the array's head, operation and call.
constexpr std::size_t kFrameLengthBytes = 4;
constexpr std::size_t kRequestHeadBytes = 1 + 1 + 9;

/// Appends items to memory that is known to be large enough.
class CborWriter {
 public:
  explicit CborWriter(unsigned char* begin) : begin_(begin), at_(begin) {}

  CborWriter& integer(std::int64_t value) { return to(putInteger(at_, value)); }
  CborWriter& number(std::uint64_t value) { return to(putHead(at_, CborMajor::Unsigned, value)); }
  CborWriter& real(double value) { return to(putDouble(at_, value)); }
  CborWriter& null() { return to(putByte(at_, kCborNull)); }
  CborWriter& map(std::size_t entries) { return to(putHead(at_, CborMajor::Map, entries)); }
  CborWriter& array(std::size_t items) { return to(putHead(at_, CborMajor::Array, items)); }
  CborWriter& text(std::string_view value) {
    return to(putString(at_, CborMajor::Text, value.data(), value.size()));
  }
  std::span<const unsigned char> bytes() const { return {begin_, at_}; }

 private:
  CborWriter& to(unsigned char* end) {
    at_ = end;
    return *this;
  }

  unsigned char* begin_;
  unsigned char* at_;
};

/// A few items on the stack.
template <std::size_t size>
class SmallCbor : public CborWriter {
 public:
  SmallCbor() : CborWriter(buffer_) {}
  SmallCbor(const SmallCbor&) = delete;
  SmallCbor& operator=(const SmallCbor&) = delete;

 private:
  unsigned char buffer_[size];
};

/// Writes the length and head of a frame whose arguments take `argumentBytes` to `target`, which has room for
/// kFrameLengthBytes + kRequestHeadBytes. Returns how many bytes it wrote; the arguments follow. `arguments`
/// is their number.
std::size_t writeRequestHead(unsigned char* target, tal_operation operation, std::uint64_t call,
                             std::size_t arguments, std::size_t argumentBytes);

/// How many arguments a request has; a hello without options.
std::size_t argumentCount(tal_operation operation);

}  // namespace tal::clientlib
