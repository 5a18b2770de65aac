#pragma once

// Values as people type them on a command line.

#include <nlohmann/json.hpp>
#include <string>
#include <string_view>
#include <utility>

namespace tal::talctl {

/// JSON whose objects keep the order in which their keys were given.
using Json = nlohmann::ordered_json;

/// 1, -1, 1.5, true, "text", {"a": 1}, [1, 2]; anything else is a string as it
/// stands. Throws UsageError for JSON that is broken, null, and numbers that 64
/// bits cannot hold.
Json parseValue(std::string_view text);

/// "key=value", the value as above; the key is all before the first "=".
std::pair<std::string, Json> parseKeyValue(std::string_view text);

}  // namespace tal::talctl
