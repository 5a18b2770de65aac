#pragma once

// Decodes the values of messages straight from CBOR items into MessageValue and
// MessageDict, with no tree in between.

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageDict.h"
#include "core/MessageValue.h"
#include "wire/CborReader.h"
#include "wire/ShapeCache.h"

namespace tal {

/// One per connection: it remembers the shapes of the messages. One thread at a
/// time. The methods that return bool leave, where they return false, what was
/// wrong in `error()`; the value is then not to be used.
class MessageDecoder {
 public:
  /// Containers that may be open at once, the request's own array included.
  static constexpr unsigned kMostNested = 32;

  /// Begins with another frame, which outlives what is read from it.
  void begin(std::string_view frame);

  CborReader& reader() { return reader_; }

  /// Reads the next item; what follows it is for the caller to read.
  bool next();
  const CborItem& item() const { return reader_.item(); }

  /// The item just read begins a message: a map with text keys. `open` is the
  /// number of containers that are open around it.
  bool dict(unsigned open, MessageDict& out);
  /// The item just read is, or begins, a text; UTF-8 is checked. The text lives
  /// until the next `begin`.
  bool text(std::string_view& out);
  /// Reads past the rest of the item just read, whatever it is, as long as it is
  /// well-formed.
  bool skip(unsigned open);

  /// The item just read as a signed 64-bit integer.
  std::optional<std::int64_t> signedInteger() const;

  /// A fixed text: why the last call failed.
  const char* error() const { return error_; }
  bool fail(const char* error) {
    error_ = error;
    return false;
  }

  bool isArray() const;
  bool isMap() const;
  /// The number of items or pairs of the array or map just begun, nothing for an
  /// indefinite one. False when the frame is too short to hold them.
  bool count(std::optional<std::size_t>& out);

 private:
  bool value(unsigned open);
  bool tagged();
  bool array(unsigned open);
  bool map(unsigned open, MessageDict& out);
  bool mapOfUnknownKeys(unsigned open, std::optional<std::size_t> pairs, std::size_t first_key,
                        std::size_t first_value, MessageDict& out);
  bool key();
  MessageDict build(std::size_t first_key, std::size_t first_value);
  bool string(CborItem::Kind chunk, std::string_view& out);
  bool checkUtf8(std::string_view bytes);

  CborReader reader_;
  ShapeCache shapes_;
  // Both are stacks: a nested container's values and keys lie on top of those of
  // the container around it. Kept from message to message.
  std::vector<MessageValue> values_;
  std::vector<std::string_view> keys_;
  // Texts that came in chunks. A deque: they must not move.
  std::deque<std::string> assembled_;
  const char* error_ = "";
};

}  // namespace tal
