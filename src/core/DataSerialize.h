#pragma once

// Property lists: a value as the XML that property-list tools read.

#include <optional>
#include <string>

#include "core/MessageValue.h"

namespace tal {

/// Serialises a property-list value: dictionary, array, string, number, date or
/// data. All operations answer nothing for what a property list cannot hold: a
/// string with a character that XML forbids, or text that is not UTF-8.
class DataSerialize {
 public:
  /// The XML property list, UTF-8.
  static std::optional<MessageData> getPlistBlob(const MessageValue& value);

  /// That XML as text; nothing as well when it holds anything beyond ASCII.
  static std::optional<std::string> getXMLInfo(const MessageValue& value);

  /// That XML as text.
  static std::optional<std::string> getDataXMLInfo(const MessageValue& value);

  /// That XML in base64, without line breaks.
  static std::optional<std::string> getBase64XMLBlob(const MessageValue& value);
};

}  // namespace tal
