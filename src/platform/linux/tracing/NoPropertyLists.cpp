// Where libplist is missing.

#include "platform/linux/tracing/XmlPropertyLists.h"

namespace tal {

PropertyLists::Result XmlPropertyLists::valueFromXml(std::string_view) const {
  return {std::nullopt, "built without libplist: no property list can be read"};
}

}  // namespace tal
