#include "platform/linux/settings/TomlText.h"

#include <toml++/toml.h>

#include <chrono>
#include <cmath>
#include <cstdint>
#include <limits>
#include <sstream>
#include <stdexcept>

#include "core/Utf8.h"

namespace tal {

namespace {

using std::chrono::floor;
using std::chrono::microseconds;

// Only within this file: `tomlText` turns it into its result.
class NotToml : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

std::chrono::sys_days dayOf(const toml::date& date) {
  using namespace std::chrono;
  return sys_days(year(date.year) / month(date.month) / day(date.day));
}

MessageDate dateOf(const toml::date_time& moment) {
  using namespace std::chrono;
  nanoseconds total = dayOf(moment.date).time_since_epoch();
  total += hours(moment.time.hour) + minutes(moment.time.minute) + seconds(moment.time.second) +
           nanoseconds(moment.time.nanosecond);
  if (moment.offset) total -= minutes(moment.offset->minutes);
  return {duration<double>(total).count()};
}

MessageDict dictOf(const toml::table& table);

MessageValue valueOf(const toml::node& node) {
  using namespace std::chrono;
  if (const auto* text = node.as_string()) return MessageValue(text->get());
  if (const auto* number = node.as_integer()) return MessageValue(number->get());
  if (const auto* real = node.as_floating_point()) return MessageValue(real->get());
  if (const auto* truth = node.as_boolean()) return MessageValue(truth->get());
  if (const auto* moment = node.as_date_time()) return MessageValue(dateOf(moment->get()));
  if (const auto* date = node.as_date()) {
    return MessageValue(MessageDate{duration<double>(dayOf(date->get()).time_since_epoch()).count()});
  }
  if (const auto* table = node.as_table()) return MessageValue(dictOf(*table));
  if (const auto* array = node.as_array()) {
    MessageArray items;
    items.reserve(array->size());
    for (const toml::node& item : *array) items.push_back(valueOf(item));
    return MessageValue(std::move(items));
  }
  std::ostringstream text;
  text << *node.as_time();
  return MessageValue(text.str());
}

MessageDict dictOf(const toml::table& table) {
  MessageDict dict;
  for (const auto& [key, node] : table) dict.set(key.str(), valueOf(node));
  return dict;
}

std::string checkedText(std::string_view text) {
  if (!isUtf8(text)) throw NotToml("text that is not UTF-8");
  return std::string(text);
}

toml::date_time momentOf(MessageDate date) {
  using namespace std::chrono;
  constexpr double kMicrosecondsPerSecond = 1e6;
  constexpr double kYear0 = -62167219200.0;
  constexpr double kYear10000 = 253402300800.0;
  const double whole = std::round(date.seconds_since_1970 * kMicrosecondsPerSecond);
  const bool held = whole >= kYear0 * kMicrosecondsPerSecond && whole < kYear10000 * kMicrosecondsPerSecond;
  if (!held) throw NotToml("a date outside the years 0 to 9999");
  const sys_time<microseconds> moment(microseconds(static_cast<std::int64_t>(whole)));
  const auto days_since_1970 = floor<days>(moment);
  const year_month_day day(days_since_1970);
  const hh_mm_ss<microseconds> time(moment - days_since_1970);
  toml::date_time result;
  result.date = {static_cast<int>(day.year()), static_cast<unsigned>(day.month()),
                 static_cast<unsigned>(day.day())};
  result.time = {static_cast<unsigned>(time.hours().count()), static_cast<unsigned>(time.minutes().count()),
                 static_cast<unsigned>(time.seconds().count()),
                 static_cast<unsigned>(nanoseconds(time.subseconds()).count())};
  result.offset = toml::time_offset{};
  return result;
}

toml::table tableOf(const MessageDict& dict);
toml::array arrayOf(const MessageArray& array);

// Hands the TOML form of the value to `take`, which knows where it belongs.
template <typename Take>
void withTomlForm(const MessageValue& value, Take take) {
  switch (value.kind()) {
    case MessageValue::Kind::kString:
      return take(checkedText(value.string()));
    case MessageValue::Kind::kUnsigned:
      if (!(MessageValue(value.toInt64()) == value)) throw NotToml("a number beyond 9223372036854775807");
      return take(value.toInt64());
    case MessageValue::Kind::kSigned:
      return take(value.toInt64());
    case MessageValue::Kind::kDouble:
      return take(value.toDouble());
    case MessageValue::Kind::kBoolean:
      return take(value.toBool());
    case MessageValue::Kind::kDate:
      return take(momentOf(*value.date()));
    case MessageValue::Kind::kArray:
      return take(arrayOf(*value.array()));
    case MessageValue::Kind::kDict:
      return take(tableOf(*value.dict()));
    case MessageValue::Kind::kData:
      break;
  }
  throw NotToml("data");
}

toml::array arrayOf(const MessageArray& array) {
  toml::array result;
  for (const MessageValue& item : array) {
    withTomlForm(item, [&](auto form) { result.push_back(std::move(form)); });
  }
  return result;
}

toml::table tableOf(const MessageDict& dict) {
  toml::table result;
  for (const auto& [key, value] : dict) {
    withTomlForm(value,
                 [&, name = checkedText(key)](auto form) { result.insert_or_assign(name, std::move(form)); });
  }
  return result;
}

}  // namespace

std::variant<MessageDict, TomlError> parseToml(std::string_view text) {
  try {
    return dictOf(toml::parse(text));
  } catch (const toml::parse_error& error) {
    return TomlError{.reason = std::string(error.description()),
                     .line = error.source().begin.line,
                     .column = error.source().begin.column};
  }
}

std::variant<std::string, TomlError> tomlText(const MessageDict& dict) {
  try {
    std::ostringstream text;
    text << tableOf(dict) << '\n';
    return text.str();
  } catch (const NotToml& error) {
    return TomlError{.reason = std::string("TOML cannot hold ") + error.what()};
  }
}

}  // namespace tal
