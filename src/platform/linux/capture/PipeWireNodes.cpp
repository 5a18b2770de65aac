#include "platform/linux/capture/PipeWireNodes.h"

#include <nlohmann/json.hpp>

#include "platform/linux/logging/LogLine.h"

namespace tal {

namespace {

using nlohmann::json;

// The text under the key, "-" when there is none.
std::string textOf(const json& object, const char* key) {
  const auto found = object.is_object() ? object.find(key) : object.end();
  return object.is_object() && found != object.end() && found->is_string() ? found->get<std::string>() : "-";
}

}  // namespace

std::string pipeWireNodes(std::string_view dump) {
  const json objects = json::parse(dump, nullptr, /*allow_exceptions=*/false);
  if (!objects.is_array()) return "not readable\n";
  std::string out = "id  state  class  name  application\n";
  for (const json& object : objects) {
    if (textOf(object, "type") != "PipeWire:Interface:Node") continue;
    const json info = object.value("info", json::object());
    const json properties = info.is_object() ? info.value("props", json::object()) : json::object();
    out += object.value("id", json(0)).dump();
    for (const std::string& text :
         {textOf(info, "state"), textOf(properties, "media.class"), textOf(properties, "node.name"),
          textOf(properties, "application.name")}) {
      out += "  ";
      appendEscaped(out, text);
    }
    out += '\n';
  }
  return out;
}

}  // namespace tal
