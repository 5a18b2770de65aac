#pragma once

// The protocol-buffers binary encoding, read from bytes that nobody vouches for.

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "core/ProtobufWriter.h"

namespace tal {

/// Reads fields one after the other and allocates nothing: what it hands out
/// refers to the bytes, which outlive it.
///
/// An error (bytes that end too early, a varint of more than ten bytes, a key
/// that no field can have, groups nested deeper than 100 or ended wrongly) is
/// final: everything after it reads as zero and empty.
class ProtobufReader {
 public:
  struct Key {
    std::uint32_t field = 0;
    ProtobufWireType type = ProtobufWireType::kVarint;
  };

  explicit ProtobufReader(std::string_view bytes) : rest_(bytes) {}

  bool hasError() const { return has_error_; }
  /// True when there is nothing more to read, for whatever reason.
  bool atEnd() const { return rest_.empty(); }

  Key readKey();
  std::uint64_t readVarint();
  std::string_view readBytes();

  /// Passes over the value of the key that was read last, a group with all that
  /// is in it. The end of a group that has not begun is an error.
  void skip(Key key);

 private:
  void fail();
  void advance(std::uint64_t bytes);
  void skipGroup(std::uint32_t field);

  std::string_view rest_;
  bool has_error_ = false;
};

}  // namespace tal
