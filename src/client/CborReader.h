// Reads CBOR item by item, on libcbor's streaming decoder.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace tal::clientlib {

/// One head of an item, or a break. Strings of a definite length bear their bytes.
struct CborToken {
  enum class Kind {
    Unsigned,
    Negative,
    Bytes,
    Text,
    ChunkedString,
    Array,
    OpenArray,
    Map,
    OpenMap,
    Tag,
    Float,
    Bool,
    Null,
    Undefined,
    Break
  };
  Kind kind = Kind::Undefined;
  /// The value of an integer (of a negative one, -1 minus the value), boolean or tag; the number of items of
  /// a container of definite length.
  std::uint64_t number = 0;
  std::string_view text;

  bool isInteger() const { return kind == Kind::Unsigned || kind == Kind::Negative; }
  /// The integer as a signed one; those that do not fit wrap.
  std::int64_t asSigned() const {
    return static_cast<std::int64_t>(kind == Kind::Negative ? ~number : number);
  }
};

/// Reads one token after the other. Borrows the bytes.
class CborReader {
 public:
  explicit CborReader(std::span<const unsigned char> bytes) : bytes_(bytes) {}

  /// False at the end and at what is no CBOR.
  bool next(CborToken& token);
  /// Reads over one whole item, with all that it holds. False where it is cut off or malformed.
  bool skip();
  std::size_t position() const { return position_; }
  bool atEnd() const { return position_ == bytes_.size(); }

 private:
  std::span<const unsigned char> bytes_;
  std::size_t position_ = 0;
};

}  // namespace tal::clientlib
