#pragma once

// TOML text to dictionaries and back. Keeps the parser's header, which is heavy,
// within one source file.

#include <string>
#include <string_view>
#include <variant>

#include "core/MessageDict.h"

namespace tal {

struct TomlError {
  std::string reason;
  unsigned line = 0;    ///< From 1; 0 where there is none.
  unsigned column = 0;  ///< From 1; 0 where there is none.
};

/// Integers become signed, floats double, tables dictionaries. A date-time
/// becomes a date, as UTC where it states no offset; a local date the midnight
/// that begins it, in UTC; a local time, which is no point in time, a string.
std::variant<MessageDict, TomlError> parseToml(std::string_view text);

/// The whole text of a file. Fails on what TOML cannot hold: data, unsigned
/// numbers beyond a signed 64-bit integer, text that is not UTF-8, dates outside
/// the years 0 to 9999. Dates are kept to the microsecond.
std::variant<std::string, TomlError> tomlText(const MessageDict& dict);

}  // namespace tal
