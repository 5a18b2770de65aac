#include "tracing/ProbeList.h"

#include <array>
#include <string_view>
#include <utility>

#include "core/MessageDict.h"

namespace tal {

namespace {

using Kind = SkeinProbeDescription::Kind;

struct KindName {
  std::string_view name;
  Kind kind;
};
constexpr std::array kKinds{KindName{"interval", Kind::kInterval}, KindName{"count", Kind::kCount},
                            KindName{"cpu", Kind::kCpu}};

std::string stringUnder(const MessageDict& dict, const MessageKey& key) {
  const MessageValue* value = dict.find(key);
  return value ? std::string(value->string()) : "";
}

ParsedProbe refused(std::string reason) { return {.description = std::nullopt, .error = std::move(reason)}; }

ParsedProbe parseInterval(const MessageDict& dict, SkeinProbeDescription probe) {
  probe.begin = stringUnder(dict, "begin");
  probe.end = stringUnder(dict, "end");
  if (probe.begin.empty() || probe.end.empty()) return refused("an interval needs the strings begin and end");
  if (const MessageValue* processes = dict.find("processes")) {
    auto names = stringList(*processes);
    if (!names) return refused("processes is no list of names");
    probe.processes = std::move(*names);
  }
  return {.description = std::move(probe), .error = ""};
}

ParsedProbe parseCount(const MessageDict& dict, SkeinProbeDescription probe) {
  const MessageValue* events = dict.find("events");
  auto names = events ? stringList(*events) : std::nullopt;
  if (!names || names->empty()) return refused("a count needs events, a list of names");
  probe.events = std::move(*names);
  return {.description = std::move(probe), .error = ""};
}

ParsedProbe parseCpu(SkeinProbeDescription probe, const std::vector<std::string>& perf_processes) {
  if (perf_processes.empty()) return refused("cpu needs TalReportingPerfProcesses in the configuration");
  probe.processes = perf_processes;
  return {.description = std::move(probe), .error = ""};
}

}  // namespace

std::optional<std::vector<std::string>> stringList(const MessageValue& value) {
  if (value.isString()) return std::vector<std::string>{std::string(value.string())};
  const MessageArray* array = value.array();
  if (!array) return std::nullopt;
  std::vector<std::string> strings;
  for (const MessageValue& element : *array) {
    if (!element.isString()) return std::nullopt;
    strings.emplace_back(element.string());
  }
  return strings;
}

ParsedProbe parseProbe(const MessageValue& entry, const std::vector<std::string>& perf_processes) {
  const MessageDict* dict = entry.dict();
  if (!dict) return refused("it is no dictionary");
  SkeinProbeDescription probe;
  probe.name = stringUnder(*dict, "name");
  if (probe.name.empty()) return refused("it has no name");
  const std::string kind = stringUnder(*dict, "kind");
  for (const KindName& known : kKinds) {
    if (kind != known.name) continue;
    probe.kind = known.kind;
    switch (known.kind) {
      case Kind::kInterval:
        return parseInterval(*dict, std::move(probe));
      case Kind::kCount:
        return parseCount(*dict, std::move(probe));
      case Kind::kCpu:
        return parseCpu(std::move(probe), perf_processes);
    }
  }
  return refused("its kind is none of interval, count, cpu");
}

}  // namespace tal
