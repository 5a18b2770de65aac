#pragma once

// A dynamic value: what a message holds under a key. Sixteen bytes, so that a
// message of a dozen keys stays within a few cache lines; text of up to fourteen
// bytes lives inside it, longer text and containers are shared nodes.

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/SharedPointer.h"

namespace tal {

class MessageDict;
class MessageValue;

using MessageArray = std::vector<MessageValue>;

/// A point in time.
struct MessageDate {
  double seconds_since_1970 = 0;
};

/// Bytes without a meaning of their own.
struct MessageData {
  std::string bytes;
};

/// A string, signed or unsigned 64-bit integer, double, boolean, date, data,
/// array or dictionary.
///
/// A copy shares arrays and dictionaries with the original: what is changed
/// through `array()` or `dict()` of one shows in the other. `deepCopy` shares
/// nothing that can change. One value belongs to one thread at a time; values
/// that share text may live on different threads.
class MessageValue {
 public:
  enum class Kind : std::uint8_t {
    kString,
    kSigned,
    kUnsigned,
    kDouble,
    kBoolean,
    kDate,
    kData,
    kArray,
    kDict
  };

  /// The empty string.
  MessageValue() noexcept;
  MessageValue(std::string_view text);
  MessageValue(const char* text) : MessageValue(std::string_view(text)) {}
  MessageValue(const std::string& text) : MessageValue(std::string_view(text)) {}
  template <typename Integer>
  requires std::integral<Integer> MessageValue(Integer value)
  noexcept {
    if constexpr (std::same_as<Integer, bool>) {
      setNumber(Form::kBoolean, static_cast<std::uint64_t>(value));
    } else if constexpr (std::signed_integral<Integer>) {
      setNumber(Form::kSigned, static_cast<std::uint64_t>(static_cast<std::int64_t>(value)));
    } else {
      setNumber(Form::kUnsigned, static_cast<std::uint64_t>(value));
    }
  }
  MessageValue(double value) noexcept;
  MessageValue(float value) noexcept : MessageValue(static_cast<double>(value)) {}
  MessageValue(MessageDate value) noexcept;
  MessageValue(const MessageData& value);
  MessageValue(MessageArray value);
  MessageValue(MessageDict value);

  /// Text that outlives every value, such as a literal: it is not copied.
  static MessageValue literal(std::string_view text) noexcept;

  MessageValue(const MessageValue& other) noexcept {
    std::memcpy(&storage_, &other.storage_, sizeof storage_);
    if (holdsNode()) retainNode();
  }
  MessageValue(MessageValue&& other) noexcept {
    std::memcpy(&storage_, &other.storage_, sizeof storage_);
    other.storage_ = Storage{};
  }
  MessageValue& operator=(const MessageValue& other) noexcept {
    MessageValue copy(other);
    swap(copy);
    return *this;
  }
  MessageValue& operator=(MessageValue&& other) noexcept {
    MessageValue moved(std::move(other));
    swap(moved);
    return *this;
  }
  ~MessageValue() {
    if (holdsNode()) releaseNode();
  }

  Kind kind() const noexcept;
  bool isString() const noexcept { return kind() == Kind::kString; }
  /// True for integers, doubles and booleans.
  bool isNumber() const noexcept;

  /// The text of a string, else empty. Valid while this value is unchanged.
  std::string_view string() const noexcept;
  /// The bytes of data, else empty. Valid while this value is unchanged.
  std::string_view data() const noexcept;
  /// The seconds of a date, else nothing.
  std::optional<MessageDate> date() const noexcept;

  /// The numeric value: booleans as 1 and 0; a string as the number that it
  /// begins with; anything else 0.
  double toDouble() const noexcept;
  /// As `toDouble`, cut towards zero and held within the range.
  std::int64_t toInt64() const noexcept;
  /// As `toInt64`, for the range of an unsigned integer.
  std::uint64_t toUInt64() const noexcept;
  /// True when a number is not 0, or a string spells a number that is not 0 or
  /// begins with one of "YyTt".
  bool toBool() const noexcept;

  /// The shared array or dictionary, or null for another kind. Changes show in
  /// every value that shares it.
  const MessageArray* array() const noexcept;
  MessageArray* array() noexcept;
  const MessageDict* dict() const noexcept;
  MessageDict* dict() noexcept;

  /// A value of its own, nested arrays and dictionaries included.
  MessageValue deepCopy() const;

  /// Numbers of any kind, booleans included, are equal when their numeric values
  /// are; otherwise kind and content decide.
  friend bool operator==(const MessageValue& a, const MessageValue& b) noexcept;

  /// Appends the text form: a string as it is; integers in decimal; doubles in
  /// their shortest round-trip form, whole ones without a fraction; booleans 1
  /// and 0; dates RFC 3339; data in hex; arrays "[a, b]"; dictionaries
  /// "{key=value, key=value}".
  void appendText(std::string& out) const;
  std::string text() const;

  /// Memory held outside the sixteen bytes.
  std::size_t footprintBytes() const;

  void swap(MessageValue& other) noexcept {
    Storage kept = storage_;
    storage_ = other.storage_;
    other.storage_ = kept;
  }

 private:
  enum class Form : std::uint8_t {
    kInlineText,
    kLiteralText,
    kSigned,
    kUnsigned,
    kDouble,
    kBoolean,
    kDate,
    // From here on the storage holds a node.
    kSharedText,
    kData,
    kArray,
    kDict,
  };
  static constexpr std::size_t kInlineCapacity = 14;

  struct Storage {
    Form form = Form::kInlineText;
    std::uint8_t inline_size = 0;
    // Inline text fills all of it; otherwise the last eight bytes hold the
    // number or pointer, and bytes 2 to 6 the size of a literal.
    char bytes[kInlineCapacity] = {};
  };
  static constexpr std::size_t kPayloadAt = 6;
  static constexpr std::size_t kLiteralSizeAt = 2;

  struct TextNode;
  struct ArrayNode;
  struct DictNode;

  bool holdsNode() const noexcept { return storage_.form >= Form::kSharedText; }
  void retainNode() const noexcept;
  void releaseNode() noexcept;
  void setText(Form form, std::string_view text);

  template <typename T>
  T payload() const noexcept {
    T value;
    std::memcpy(&value, storage_.bytes + kPayloadAt, sizeof value);  // NOLINT(bugprone-sizeof-expression)
    return value;
  }
  void setNumber(Form form, std::uint64_t bits) noexcept {
    storage_.form = form;
    std::memcpy(storage_.bytes + kPayloadAt, &bits, sizeof bits);
  }
  void setNode(Form form, SharedNode* node) noexcept;

  alignas(8) Storage storage_;
};

static_assert(sizeof(MessageValue) == 16);

}  // namespace tal
