#include "platform/linux/tracing/XmlPropertyLists.h"

#include <plist/plist.h>

#include <cstdlib>
#include <limits>
#include <memory>
#include <string>
#include <utility>

#include "core/MessageDict.h"

namespace tal {

namespace {

// The library frees nested nodes by recursion, and the values made of them are read by recursion, so what
// comes from outside is looked at first. Nothing nests deeper than it has containers.
constexpr std::size_t kMostContainers = 2000;

struct FreePlist {
  void operator()(void* node) const { plist_free(node); }
};
using Plist = std::unique_ptr<void, FreePlist>;

struct FreeMemory {
  void operator()(void* memory) const { std::free(memory); }
};

// Wherever they begin: to tell those within comments, one would have to see comments as the library does.
bool hasTooManyContainers(std::string_view xml) {
  std::size_t containers = 0;
  for (std::size_t at = xml.find('<'); at != std::string_view::npos; at = xml.find('<', at + 1)) {
    const std::string_view rest = xml.substr(at + 1);
    if (rest.starts_with("array") || rest.starts_with("dict")) ++containers;
  }
  return containers > kMostContainers;
}

MessageValue valueOf(plist_t node);

MessageValue textOf(plist_t node) {
  std::uint64_t size = 0;
  const char* text = plist_get_string_ptr(node, &size);
  return std::string_view(text ? text : "", text ? size : 0);
}

MessageValue dateOf(plist_t node) {
  constexpr double kMicroseconds = 1e6;
  constexpr double kSeconds2001 = 978307200;  // the library counts from 2001
  std::int32_t seconds = 0;
  std::int32_t microseconds = 0;
  plist_get_date_val(node, &seconds, &microseconds);
  return MessageDate{kSeconds2001 + seconds + microseconds / kMicroseconds};
}

MessageValue dataOf(plist_t node) {
  std::uint64_t size = 0;
  const char* bytes = plist_get_data_ptr(node, &size);
  return MessageData{std::string(bytes ? bytes : "", bytes ? size : 0)};
}

MessageValue arrayOf(plist_t node) {
  MessageArray array;
  const std::uint32_t size = plist_array_get_size(node);
  for (std::uint32_t i = 0; i < size; ++i) array.push_back(valueOf(plist_array_get_item(node, i)));
  return array;
}

MessageValue dictOf(plist_t node) {
  MessageDict dict;
  plist_dict_iter position = nullptr;
  plist_dict_new_iter(node, &position);
  const std::unique_ptr<void, FreeMemory> owned(position);
  for (;;) {
    char* key = nullptr;
    plist_t value = nullptr;
    plist_dict_next_item(node, position, &key, &value);
    const std::unique_ptr<char, FreeMemory> owned_key(key);
    if (!key || !value) return dict;
    dict.set(key, valueOf(value));
  }
}

MessageValue valueOf(plist_t node) {
  switch (plist_get_node_type(node)) {
    case PLIST_BOOLEAN: {
      std::uint8_t value = 0;
      plist_get_bool_val(node, &value);
      return value != 0;
    }
    case PLIST_UINT: {
      std::uint64_t value = 0;
      plist_get_uint_val(node, &value);
      return value;
    }
    case PLIST_REAL: {
      double value = 0;
      plist_get_real_val(node, &value);
      return value;
    }
    case PLIST_ARRAY:
      return arrayOf(node);
    case PLIST_DICT:
      return dictOf(node);
    case PLIST_DATE:
      return dateOf(node);
    case PLIST_DATA:
      return dataOf(node);
    default:
      return textOf(node);
  }
}

}  // namespace

PropertyLists::Result XmlPropertyLists::valueFromXml(std::string_view xml) const {
  if (xml.size() > std::numeric_limits<std::uint32_t>::max())
    return {std::nullopt, "the property list is too large"};
  if (hasTooManyContainers(xml)) {
    return {std::nullopt,
            "the property list has over " + std::to_string(kMostContainers) + " arrays and dictionaries"};
  }
  plist_t root = nullptr;
  plist_from_xml(xml.data(), static_cast<std::uint32_t>(xml.size()), &root);
  const Plist owned(root);
  if (!root) return {std::nullopt, "it is no XML property list"};
  return {valueOf(root), ""};
}

}  // namespace tal
