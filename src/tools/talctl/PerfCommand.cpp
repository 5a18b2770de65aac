#include "tools/talctl/PerfCommand.h"

#include <array>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <nlohmann/json.hpp>
#include <optional>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

using Json = nlohmann::json;

struct Metric {
  std::string name;
  std::string unit;
  double value = 0;
  Json fields;
};

struct Results {
  Json head;
  std::vector<Metric> metrics;
};

std::string contentOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) throw CommandFailure(path + ": cannot be read");
  return {std::istreambuf_iterator<char>(file), {}};
}

Results parse(const std::string& name, const std::string& content) {
  try {
    Results results{.head = Json::parse(content), .metrics = {}};
    for (const Json& metric : results.head.at("metrics")) {
      results.metrics.push_back({.name = metric.at("name").get<std::string>(),
                                 .unit = metric.at("unit").get<std::string>(),
                                 .value = metric.at("value").get<double>(),
                                 .fields = metric});
    }
    return results;
  } catch (const Json::exception&) {
    throw CommandFailure(name + ": holds no performance data");
  }
}

std::string number(double value) {
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%.3f", value);
  return text.data();
}

std::string fieldText(const Json& fields, const char* key) {
  const auto found = fields.find(key);
  if (found == fields.end() || !found->is_number()) return "-";
  return found->is_number_integer() ? found->dump() : number(found->get<double>());
}

std::string headText(const std::string& name, const Results& results) {
  std::string text = escapeControls(name) + '\n';
  for (const char* key : {"test_name", "host", "kernel", "cpu_model", "start_time"}) {
    const auto found = results.head.find(key);
    if (found == results.head.end() || !found->is_string()) continue;
    text += "  " + std::string(key) + ": " + escapeControls(found->get<std::string>()) + '\n';
  }
  return text;
}

std::string metricsOfOne(const Results& results, Width width) {
  Table table({"METRIC", "VALUE", "UNIT", "COUNT", "MIN", "P50", "P95", "P99", "MAX"});
  for (const Metric& metric : results.metrics) {
    const auto field = [&metric](const char* key) { return fieldText(metric.fields, key); };
    table.addRow({metric.name, number(metric.value), metric.unit, field("count"), field("minimum"),
                  field("percentile_50"), field("percentile_95"), field("percentile_99"), field("maximum")});
  }
  return table.text(width);
}

const Metric* findMetric(const Results& results, const std::string& name) {
  for (const Metric& metric : results.metrics) {
    if (metric.name == name) return &metric;
  }
  return nullptr;
}

std::string changeText(double before, double after) {
  constexpr double kPerCent = 100;
  if (before == 0) return after == 0 ? "+0.0 %" : "-";
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%+.1f %%", (after - before) / before * kPerCent);
  return text.data();
}

// In the order of the first file, then what only the second has.
std::string metricsOfTwo(const Results& first, const Results& second, Width width) {
  Table table({"METRIC", "UNIT", "FIRST", "SECOND", "CHANGE"});
  for (const Metric& metric : first.metrics) {
    const Metric* other = findMetric(second, metric.name);
    table.addRow({metric.name, metric.unit, number(metric.value), other ? number(other->value) : "-",
                  other ? changeText(metric.value, other->value) : "-"});
  }
  for (const Metric& metric : second.metrics) {
    if (!findMetric(first, metric.name))
      table.addRow({metric.name, metric.unit, "-", number(metric.value), "-"});
  }
  return table.text(width);
}

}  // namespace

std::string perfText(const std::vector<std::string>& names, const std::vector<std::string>& contents,
                     Width width) {
  if (contents.empty() || contents.size() > 2) throw UsageError("one file, or two to compare");
  const Results first = parse(names[0], contents[0]);
  std::string text = headText(names[0], first);
  if (contents.size() == 1) return text + metricsOfOne(first, width);
  const Results second = parse(names[1], contents[1]);
  return text + headText(names[1], second) + metricsOfTwo(first, second, width);
}

void runPerfShow(const std::vector<std::string>& files, const Terminal& terminal) {
  std::vector<std::string> contents;
  contents.reserve(files.size());
  for (const std::string& file : files) contents.push_back(contentOf(file));
  terminal.write(perfText(files, contents, terminal.width()));
}

}  // namespace tal::talctl
