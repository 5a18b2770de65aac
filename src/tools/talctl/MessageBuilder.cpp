#include "tools/talctl/MessageBuilder.h"

#include <chrono>
#include <cmath>
#include <cstdint>
#include <string>
#include <string_view>

#include "core/Utf8.h"
#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

using client::Message;

std::string decodeBase64(std::string_view text) {
  constexpr std::string_view kDigits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  const UsageError wrong("\"$data\" is not base64");
  if (text.size() % 4 != 0) throw wrong;
  std::size_t padding = 0;
  for (; padding < 2 && text.ends_with('='); ++padding) text.remove_suffix(1);
  std::string bytes;
  std::uint32_t bits = 0;
  int bit_count = 0;
  for (const char digit : text) {
    const std::size_t value = kDigits.find(digit);
    if (value == std::string_view::npos) throw wrong;
    bits = bits << 6 | static_cast<std::uint32_t>(value);
    bit_count += 6;
    if (bit_count < 8) continue;
    bit_count -= 8;
    bytes += static_cast<char>(bits >> bit_count & 0xFFU);
  }
  return bytes;
}

Message::Date dateFrom(const Json& seconds) {
  if (!seconds.is_number()) throw UsageError("\"$date\" wants seconds since 1970");
  const std::chrono::duration<double> since_1970(seconds.get<double>());
  // The clock counts nanoseconds in 64 bits.
  constexpr std::chrono::duration<double> kMost = std::chrono::hours(24 * 365 * 290);
  if (std::abs(since_1970.count()) > kMost.count()) throw UsageError("\"$date\" is out of range");
  return Message::Date(std::chrono::duration_cast<Message::Date::duration>(since_1970));
}

/// Puts values under a key or, where there is none, at the end of an array.
class Builder {
 public:
  explicit Builder(Message& message) : message_(message) {}

  void put(const std::string* key, const Json& value, int depth) {
    switch (value.type()) {
      case Json::value_t::boolean:
        return add(key, value.get<bool>());
      case Json::value_t::number_integer:
        return add(key, value.get<std::int64_t>());
      case Json::value_t::number_unsigned:
        return add(key, value.get<std::uint64_t>());
      case Json::value_t::number_float:
        return add(key, value.get<double>());
      case Json::value_t::string:
        return add(key, text(value.get_ref<const std::string&>()));
      case Json::value_t::array:
        return putArray(key, value, depth);
      case Json::value_t::object:
        return putObject(key, value, depth);
      default:
        throw UsageError("null is no value of a message");
    }
  }

  void putEntries(const Json& object, int depth) {
    if (depth > TAL_MAX_NESTING) throw UsageError("a message cannot be nested so deep");
    for (const auto& [key, value] : object.items()) put(&text(key), value, depth);
  }

 private:
  static const std::string& text(const std::string& text) {
    if (!isUtf8(text)) throw UsageError("a key or text is not UTF-8");
    return text;
  }

  template <typename Value>
  void add(const std::string* key, const Value& value) {
    key ? message_.add(*key, value) : message_.append(value);
  }

  void putArray(const std::string* key, const Json& array, int depth) {
    if (depth >= TAL_MAX_NESTING) throw UsageError("a message cannot be nested so deep");
    const auto fill = [&](Message&) {
      for (const Json& element : array) put(nullptr, element, depth + 1);
    };
    key ? message_.addArray(*key, fill) : message_.appendArray(fill);
  }

  void putObject(const std::string* key, const Json& object, int depth) {
    if (object.size() == 1 && object.contains("$date")) return add(key, dateFrom(object["$date"]));
    if (object.size() == 1 && object.contains("$data")) {
      const Json& encoded = object["$data"];
      if (!encoded.is_string()) throw UsageError("\"$data\" wants a string");
      const std::string bytes = decodeBase64(encoded.get_ref<const std::string&>());
      return add(key, Message::Data{bytes.data(), bytes.size()});
    }
    const auto fill = [&](Message&) { putEntries(object, depth + 1); };
    key ? message_.addMap(*key, fill) : message_.appendMap(fill);
  }

  Message& message_;
};

}  // namespace

Message buildMessage(const Json& object) {
  if (!object.is_object()) throw UsageError("a message is a JSON object");
  Message message;
  Builder(message).putEntries(object, 1);
  if (message.status() != TAL_OK) {
    throw UsageError(std::string("the message cannot be built: ") + tal_status_text(message.status()));
  }
  return message;
}

}  // namespace tal::talctl
