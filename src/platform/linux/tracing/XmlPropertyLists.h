#pragma once

#include "platform/PropertyLists.h"

namespace tal {

/// Built without libplist it refuses every list.
class XmlPropertyLists final : public PropertyLists {
 public:
  Result valueFromXml(std::string_view xml) const override;
};

}  // namespace tal
