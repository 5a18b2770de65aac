#include "tools/talctl/report/JsonMembers.h"

#include <algorithm>
#include <charconv>

#include "tools/talctl/ArgumentValue.h"

namespace tal::talctl {
namespace {

constexpr std::string_view kUnknown = "unknown";
// A name that fills a screen helps nobody, and there may be many.
constexpr std::size_t kLongestText = 160;

bool isBlank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

std::string joined(const Json& array) {
  std::string text;
  for (const Json& element : array) {
    if (!text.empty()) text += ", ";
    text += element.is_string() ? element.get<std::string>()
                                : element.dump(-1, ' ', false, Json::error_handler_t::replace);
  }
  return text;
}

/// The beginning of the text that is short enough, without a part of a character at its end.
std::string_view shortened(std::string_view text) {
  if (text.size() <= kLongestText) return text;
  std::size_t size = kLongestText;
  while (size > 0 && (static_cast<unsigned char>(text[size]) & 0xC0U) == 0x80U) --size;
  return text.substr(0, size);
}

}  // namespace

JsonMembers::JsonMembers(std::string_view object) : rest_(object) {
  skipBlanks();
  if (!take('{')) rest_ = {};
}

bool JsonMembers::next() {
  skipBlanks();
  if (take('}')) {
    skipBlanks();
    complete_ = rest_.empty();
    rest_ = {};
    return false;
  }
  if (!first_ && !take(',')) return false;
  first_ = false;
  skipBlanks();
  if (!takeString(key_)) return false;
  skipBlanks();
  if (!take(':')) return false;
  skipBlanks();
  return takeValue();
}

bool JsonMembers::take(char expected) {
  if (rest_.empty() || rest_.front() != expected) return false;
  rest_.remove_prefix(1);
  return true;
}

bool JsonMembers::takeString(std::string_view& inside) {
  if (rest_.empty() || rest_.front() != '"') return false;
  std::size_t quote = 0;
  std::size_t backslashes = 0;
  do {
    quote = rest_.find('"', quote + 1);
    if (quote == std::string_view::npos) return false;
    backslashes = 0;
    while (rest_[quote - 1 - backslashes] == '\\') ++backslashes;
  } while (backslashes % 2 == 1);
  inside = rest_.substr(1, quote - 1);
  rest_.remove_prefix(quote + 1);
  return true;
}

bool JsonMembers::takeValue() {
  const std::string_view begin = rest_;
  std::string_view inside;
  if (rest_.empty()) return false;
  if (rest_.front() == '"') {
    if (!takeString(inside)) return false;
  } else if (rest_.front() == '{' || rest_.front() == '[') {
    if (!takeNested()) return false;
  } else {
    while (!rest_.empty() && rest_.front() != ',' && rest_.front() != '}' && !isBlank(rest_.front())) {
      rest_.remove_prefix(1);
    }
  }
  value_ = begin.substr(0, begin.size() - rest_.size());
  return !value_.empty();
}

bool JsonMembers::takeNested() {
  std::size_t depth = 0;
  std::string_view inside;
  while (!rest_.empty()) {
    const char c = rest_.front();
    if (c == '"') {
      if (!takeString(inside)) return false;
      continue;
    }
    rest_.remove_prefix(1);
    if (c == '{' || c == '[') ++depth;
    if ((c == '}' || c == ']') && --depth == 0) return true;
  }
  return false;
}

void JsonMembers::skipBlanks() {
  while (!rest_.empty() && isBlank(rest_.front())) rest_.remove_prefix(1);
}

double numberOf(std::string_view value) {
  double number = 0;
  const auto [end, error] = std::from_chars(value.data(), value.data() + value.size(), number);
  return error == std::errc() && end == value.data() + value.size() ? number : 0;
}

std::string_view textOf(std::string_view value, std::string& buffer) {
  if (value.empty() || value == "null" || value == "\"\"") return kUnknown;
  const bool is_string = value.front() == '"';
  if (is_string && value.find('\\') == std::string_view::npos)
    return shortened(value.substr(1, value.size() - 2));
  if (!is_string && value.front() != '[') return shortened(value);
  const Json parsed = Json::parse(value, nullptr, false);
  if (parsed.is_discarded()) return shortened(value);
  buffer = parsed.is_string() ? parsed.get<std::string>() : joined(parsed);
  return buffer.empty() ? kUnknown : shortened(buffer);
}

}  // namespace tal::talctl
