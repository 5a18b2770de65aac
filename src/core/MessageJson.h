#pragma once

// Dictionaries as JSON: what the store, the outbox and summaries hold.

#include <string>

#include "core/MessageDict.h"

namespace tal {

/// What becomes of a double that JSON cannot hold (NaN, infinities).
enum class JsonNonFinite { kNull, kFail };

/// Appends the value as JSON text without white space: strings in UTF-8 with
/// control characters escaped (bytes that are no UTF-8 become U+FFFD); integers
/// in decimal; doubles in their shortest round-trip form, whole ones with ".0";
/// booleans; dates as RFC 3339 UTC text with microseconds; data as base64 text;
/// arrays; objects in the dictionary's order.
///
/// False, with `out` unchanged, when `non_finite` is kFail and there is such a
/// double.
bool appendJson(std::string& out, const MessageValue& value, JsonNonFinite non_finite = JsonNonFinite::kNull);
bool appendJson(std::string& out, const MessageDict& dict, JsonNonFinite non_finite = JsonNonFinite::kNull);

}  // namespace tal
