#include "tools/talctl/ArgumentValue.h"

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

/// The number that the whole text spells, or null where it spells none.
Json parseNumber(std::string_view text) {
  Json number;
  try {
    number = Json::parse(text);
  } catch (const Json::parse_error&) {
    return nullptr;  // "10m", "2026-01-31", "1.2.3": a word that begins with a digit
  } catch (const Json::out_of_range&) {
    throw UsageError("'" + std::string(text) + "' is too large for a number");
  }
  // The parser turns an integer beyond 64 bits into a double, which would alter its digits.
  if (number.is_number_float() && text.find_first_of(".eE") == std::string_view::npos) {
    throw UsageError("'" + std::string(text) + "' does not fit 64 bits");
  }
  return number;
}

}  // namespace

Json parseValue(std::string_view text) {
  if (text.empty()) return "";
  if (text == "true") return true;
  if (text == "false") return false;
  if (text == "null") throw UsageError("null is no value; quote it for the word: '\"null\"'");

  const char first = text.front();
  if (first == '"' || first == '{' || first == '[') {
    Json value = Json::parse(text, nullptr, false);
    if (value.is_discarded()) throw UsageError("'" + std::string(text) + "' is not well-formed JSON");
    return value;
  }
  const bool digit_or_minus = first == '-' || (first >= '0' && first <= '9');
  const bool one_word = text.find_first_of(" \t\r\n") == std::string_view::npos;
  if (digit_or_minus && one_word) {
    if (Json number = parseNumber(text); !number.is_null()) return number;
  }
  return std::string(text);
}

std::pair<std::string, Json> parseKeyValue(std::string_view text) {
  const std::size_t equals = text.find('=');
  if (equals == std::string_view::npos || equals == 0) {
    throw UsageError("'" + std::string(text) + "' is not of the form key=value");
  }
  return {std::string(text.substr(0, equals)), parseValue(text.substr(equals + 1))};
}

}  // namespace tal::talctl
