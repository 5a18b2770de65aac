#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "core/MessageValue.h"

namespace tal {

/// Reads property lists. Any thread.
class PropertyLists {
 public:
  struct Result {
    std::optional<MessageValue> value;  ///< nothing on failure
    std::string error;
  };

  virtual ~PropertyLists() = default;

  /// Of an XML property list; other forms are refused.
  virtual Result valueFromXml(std::string_view xml) const = 0;
};

}  // namespace tal
