#include "core/MessageValue.h"

#include <algorithm>
#include <bit>
#include <charconv>
#include <cmath>
#include <limits>
#include <memory>
#include <new>
#include <utility>

#include "core/DateText.h"
#include "core/MessageDict.h"

namespace tal {

// The text follows the node in the same allocation.
struct MessageValue::TextNode : SharedNode {
  explicit TextNode(std::size_t text_size) : size(text_size) {}
  static TextNode* make(std::string_view text) {
    void* memory = ::operator new(sizeof(TextNode) + text.size());
    auto* node = new (memory) TextNode(text.size());
    std::memcpy(node->characters(), text.data(), text.size());
    return node;
  }
  char* characters() { return reinterpret_cast<char*>(this + 1); }
  std::string_view view() { return {characters(), size}; }

  std::size_t size;
};

struct MessageValue::ArrayNode : SharedNode {
  explicit ArrayNode(MessageArray array) : items(std::move(array)) {}
  MessageArray items;
};

struct MessageValue::DictNode : SharedNode {
  explicit DictNode(MessageDict dict) : entries(std::move(dict)) {}
  MessageDict entries;
};

MessageValue::MessageValue() noexcept = default;

MessageValue::MessageValue(std::string_view text) {
  if (text.size() <= kInlineCapacity) {
    storage_.inline_size = static_cast<std::uint8_t>(text.size());
    if (!text.empty()) std::memcpy(storage_.bytes, text.data(), text.size());
  } else {
    setText(Form::kSharedText, text);
  }
}

MessageValue::MessageValue(double value) noexcept {
  setNumber(Form::kDouble, std::bit_cast<std::uint64_t>(value));
}

MessageValue::MessageValue(MessageDate value) noexcept {
  setNumber(Form::kDate, std::bit_cast<std::uint64_t>(value.seconds_since_1970));
}

MessageValue::MessageValue(const MessageData& value) { setText(Form::kData, value.bytes); }

MessageValue::MessageValue(MessageArray value) { setNode(Form::kArray, new ArrayNode(std::move(value))); }

MessageValue::MessageValue(MessageDict value) { setNode(Form::kDict, new DictNode(std::move(value))); }

MessageValue MessageValue::literal(std::string_view text) noexcept {
  MessageValue value;
  const auto size = static_cast<std::uint32_t>(text.size());
  value.setNumber(Form::kLiteralText, std::bit_cast<std::uint64_t>(text.data()));
  std::memcpy(value.storage_.bytes + kLiteralSizeAt, &size, sizeof size);
  return value;
}

void MessageValue::setText(Form form, std::string_view text) { setNode(form, TextNode::make(text)); }

void MessageValue::setNode(Form form, SharedNode* node) noexcept {
  setNumber(form, std::bit_cast<std::uint64_t>(node));
}

void MessageValue::retainNode() const noexcept { payload<SharedNode*>()->retain(); }

void MessageValue::releaseNode() noexcept {
  auto* node = payload<SharedNode*>();
  if (!node->release()) return;
  switch (storage_.form) {
    case Form::kArray:
      delete static_cast<ArrayNode*>(node);
      break;
    case Form::kDict:
      delete static_cast<DictNode*>(node);
      break;
    default:
      ::operator delete(static_cast<TextNode*>(node));
      break;
  }
}

MessageValue::Kind MessageValue::kind() const noexcept {
  switch (storage_.form) {
    case Form::kInlineText:
    case Form::kLiteralText:
    case Form::kSharedText:
      return Kind::kString;
    case Form::kSigned:
      return Kind::kSigned;
    case Form::kUnsigned:
      return Kind::kUnsigned;
    case Form::kDouble:
      return Kind::kDouble;
    case Form::kBoolean:
      return Kind::kBoolean;
    case Form::kDate:
      return Kind::kDate;
    case Form::kData:
      return Kind::kData;
    case Form::kArray:
      return Kind::kArray;
    case Form::kDict:
      return Kind::kDict;
  }
  return Kind::kString;
}

bool MessageValue::isNumber() const noexcept {
  return storage_.form >= Form::kSigned && storage_.form <= Form::kBoolean;
}

std::string_view MessageValue::string() const noexcept {
  switch (storage_.form) {
    case Form::kInlineText:
      return {storage_.bytes, storage_.inline_size};
    case Form::kLiteralText: {
      std::uint32_t size = 0;
      std::memcpy(&size, storage_.bytes + kLiteralSizeAt, sizeof size);
      return {payload<const char*>(), size};
    }
    case Form::kSharedText:
      return static_cast<TextNode*>(payload<SharedNode*>())->view();
    default:
      return {};
  }
}

std::string_view MessageValue::data() const noexcept {
  return storage_.form == Form::kData ? static_cast<TextNode*>(payload<SharedNode*>())->view()
                                      : std::string_view{};
}

std::optional<MessageDate> MessageValue::date() const noexcept {
  if (storage_.form != Form::kDate) return std::nullopt;
  return MessageDate{payload<double>()};
}

double MessageValue::toDouble() const noexcept {
  switch (storage_.form) {
    case Form::kSigned:
      return static_cast<double>(payload<std::int64_t>());
    case Form::kUnsigned:
    case Form::kBoolean:
      return static_cast<double>(payload<std::uint64_t>());
    case Form::kDouble:
      return payload<double>();
    default:
      break;
  }
  const std::string_view text = string();
  double number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

std::int64_t MessageValue::toInt64() const noexcept {
  constexpr auto kMost = std::numeric_limits<std::int64_t>::max();
  constexpr auto kLeast = std::numeric_limits<std::int64_t>::min();
  if (storage_.form == Form::kSigned) return payload<std::int64_t>();
  if (storage_.form == Form::kUnsigned || storage_.form == Form::kBoolean) {
    return static_cast<std::int64_t>(std::min<std::uint64_t>(payload<std::uint64_t>(), kMost));
  }
  if (kind() == Kind::kString) {
    const std::string_view text = string();
    std::int64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error == std::errc{} && (end == text.data() + text.size() || *end != '.')) return number;
  }
  const double number = toDouble();
  if (std::isnan(number)) return 0;
  if (number >= static_cast<double>(kMost)) return kMost;
  if (number <= static_cast<double>(kLeast)) return kLeast;
  return static_cast<std::int64_t>(number);
}

std::uint64_t MessageValue::toUInt64() const noexcept {
  // Only an unsigned integer reaches beyond the signed range.
  if (storage_.form == Form::kUnsigned) return payload<std::uint64_t>();
  return static_cast<std::uint64_t>(std::max<std::int64_t>(toInt64(), 0));
}

bool MessageValue::toBool() const noexcept {
  if (kind() == Kind::kString) {
    const std::string_view text = string();
    if (!text.empty() && std::string_view("YyTt").find(text.front()) != std::string_view::npos) return true;
  }
  return toDouble() != 0;
}

const MessageArray* MessageValue::array() const noexcept {
  return storage_.form == Form::kArray ? &static_cast<ArrayNode*>(payload<SharedNode*>())->items : nullptr;
}

MessageArray* MessageValue::array() noexcept {
  return const_cast<MessageArray*>(std::as_const(*this).array());
}

const MessageDict* MessageValue::dict() const noexcept {
  return storage_.form == Form::kDict ? &static_cast<DictNode*>(payload<SharedNode*>())->entries : nullptr;
}

MessageDict* MessageValue::dict() noexcept { return const_cast<MessageDict*>(std::as_const(*this).dict()); }

MessageValue MessageValue::deepCopy() const {
  if (const MessageArray* items = array()) {
    MessageArray copies;
    copies.reserve(items->size());
    for (const MessageValue& item : *items) copies.push_back(item.deepCopy());
    return MessageValue(std::move(copies));
  }
  if (const MessageDict* entries = dict()) return MessageValue(entries->deepCopy());
  return *this;
}

namespace {

// Exact: a conversion of the integer to double could round.
template <typename Integer>
bool equalsInteger(double number, Integer integer) {
  constexpr double kBeyond = std::is_signed_v<Integer> ? 0x1p63 : 0x1p64;
  const double kLeast = std::is_signed_v<Integer> ? -0x1p63 : 0.0;
  return number >= kLeast && number < kBeyond && std::trunc(number) == number &&
         static_cast<Integer>(number) == integer;
}

}  // namespace

bool operator==(const MessageValue& a, const MessageValue& b) noexcept {
  using Form = MessageValue::Form;
  const auto isInteger = [](const MessageValue& v) {
    return v.isNumber() && v.storage_.form != Form::kDouble;
  };
  if (isInteger(a) && isInteger(b)) {
    const auto left = a.payload<std::uint64_t>();
    const auto right = b.payload<std::uint64_t>();
    // Equal bits mean equal numbers unless the top bit is a sign on one side only.
    const bool mixed = (a.storage_.form == Form::kSigned) != (b.storage_.form == Form::kSigned);
    return left == right && !(mixed && (left >> 63) != 0);
  }
  if (a.isNumber() && b.isNumber()) {
    if (!isInteger(a) && !isInteger(b)) return a.payload<double>() == b.payload<double>();
    const MessageValue& real = isInteger(a) ? b : a;
    const MessageValue& whole = isInteger(a) ? a : b;
    return whole.storage_.form == Form::kSigned
               ? equalsInteger(real.payload<double>(), whole.payload<std::int64_t>())
               : equalsInteger(real.payload<double>(), whole.payload<std::uint64_t>());
  }
  if (a.kind() != b.kind()) return false;
  switch (a.kind()) {
    case MessageValue::Kind::kString:
      return a.string() == b.string();
    case MessageValue::Kind::kDate:
      return a.payload<double>() == b.payload<double>();
    case MessageValue::Kind::kData:
      return a.data() == b.data();
    case MessageValue::Kind::kArray:
      return *a.array() == *b.array();
    case MessageValue::Kind::kDict:
      return *a.dict() == *b.dict();
    default:
      return false;
  }
}

namespace {

template <typename Number>
void appendNumber(std::string& out, Number number) {
  char digits[32];
  const auto end = std::to_chars(digits, digits + sizeof digits, number).ptr;
  out.append(digits, end);
}

// A NaN's sign means nothing and does not survive every encoding, so that it is not shown.
void appendReal(std::string& out, double number) {
  if (std::isnan(number)) {
    out += "nan";
  } else {
    appendNumber(out, number);
  }
}

void appendHex(std::string& out, std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  for (const char byte : bytes) {
    const auto value = static_cast<unsigned char>(byte);
    out += kDigits[value >> 4];
    out += kDigits[value & 15];
  }
}

}  // namespace

void MessageValue::appendText(std::string& out) const {
  switch (kind()) {
    case Kind::kString:
      out += string();
      break;
    case Kind::kSigned:
      appendNumber(out, payload<std::int64_t>());
      break;
    case Kind::kUnsigned:
    case Kind::kBoolean:
      appendNumber(out, payload<std::uint64_t>());
      break;
    case Kind::kDouble:
      appendReal(out, payload<double>());
      break;
    case Kind::kDate:
      appendRfc3339(out, payload<double>());
      break;
    case Kind::kData:
      appendHex(out, data());
      break;
    case Kind::kArray: {
      out += '[';
      bool first = true;
      for (const MessageValue& item : *array()) {
        if (!std::exchange(first, false)) out += ", ";
        item.appendText(out);
      }
      out += ']';
      break;
    }
    case Kind::kDict:
      dict()->appendText(out);
      break;
  }
}

std::string MessageValue::text() const {
  std::string out;
  appendText(out);
  return out;
}

std::size_t MessageValue::footprintBytes() const {
  constexpr std::size_t kAllocationOverhead = 16;
  switch (storage_.form) {
    case Form::kSharedText:
      return sizeof(TextNode) + string().size() + kAllocationOverhead;
    case Form::kData:
      return sizeof(TextNode) + data().size() + kAllocationOverhead;
    case Form::kArray: {
      std::size_t bytes = sizeof(ArrayNode) + array()->capacity() * sizeof(MessageValue);
      for (const MessageValue& item : *array()) bytes += item.footprintBytes();
      return bytes;
    }
    case Form::kDict:
      return sizeof(DictNode) + dict()->footprintBytes();
    default:
      return 0;
  }
}

}  // namespace tal
