#pragma once

// The bytes of one frame as a sequence of CBOR items, read by libcbor's
// streaming decoder. It is turned from push to pull here, so that the code that
// knows what it expects next can ask for it.

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tal {

/// One item: a whole scalar, or the beginning of something longer.
struct CborItem {
  enum class Kind : std::uint8_t {
    kUnsigned,    ///< `number`
    kNegative,    ///< -1 - `number`
    kBytes,       ///< `bytes`
    kText,        ///< `bytes`, not yet known to be UTF-8
    kBytesStart,  ///< indefinite: chunks follow, then kBreak
    kTextStart,   ///< indefinite: chunks follow, then kBreak
    kArray,       ///< `number` items follow
    kArrayStart,  ///< indefinite: items follow, then kBreak
    kMap,         ///< `number` pairs follow
    kMapStart,    ///< indefinite: pairs follow, then kBreak
    kTag,         ///< `number`; the tagged item follows
    kFloat,       ///< `real`
    kBoolean,     ///< `number` is 1 or 0
    kNull,
    kUndefined,
    kBreak,
  };

  Kind kind = Kind::kUndefined;
  std::uint64_t number = 0;
  double real = 0;
  /// Points into the frame.
  std::string_view bytes;
};

/// Reads the items of one frame in turn. What it hands out points into the frame.
class CborReader {
 public:
  explicit CborReader(std::string_view frame = {}) : rest_(frame) {}

  /// False at the end of the bytes and at anything that is not well-formed.
  bool next();
  const CborItem& item() const { return item_; }

  /// What has not been read yet.
  std::string_view rest() const { return rest_; }

  /// Steps over bytes at the front whose meaning the caller knows.
  void skip(std::size_t count) { rest_.remove_prefix(count); }

 private:
  struct Callbacks;

  std::string_view rest_;
  CborItem item_;
};

}  // namespace tal
