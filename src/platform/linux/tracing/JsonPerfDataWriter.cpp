#include "platform/linux/tracing/JsonPerfDataWriter.h"

#include <sys/utsname.h>

#include <fstream>
#include <utility>

#include "core/MessageJson.h"

namespace tal {

namespace {

constexpr char kUnknown[] = "unknown";

std::string cpuModel() {
  std::ifstream file("/proc/cpuinfo");
  std::string line;
  while (std::getline(file, line)) {
    if (!line.starts_with("model name") && !line.starts_with("Model")) continue;
    const auto value = line.find_first_not_of(": \t", line.find(':'));
    if (value != std::string::npos) return line.substr(value);
  }
  return kUnknown;
}

MessageDict hostFacts() {
  utsname names{};
  const bool known = ::uname(&names) == 0;
  return {{"host", known ? static_cast<const char*>(names.nodename) : kUnknown},
          {"kernel", known ? static_cast<const char*>(names.release) : kUnknown},
          {"cpu_model", cpuModel()}};
}

MessageDict metricDict(const PerfMetric& metric) {
  MessageDict dict{{"name", metric.name}, {"unit", metric.unit}, {"value", metric.value}};
  if (metric.samples.count == 0) return dict;
  dict.set("count", metric.samples.count);
  dict.set("minimum", metric.samples.minimum);
  dict.set("maximum", metric.samples.maximum);
  dict.set("percentile_50", metric.samples.percentile_50);
  dict.set("percentile_95", metric.samples.percentile_95);
  dict.set("percentile_99", metric.samples.percentile_99);
  return dict;
}

class JsonPerfDataWriter final : public PerfDataWriter {
 public:
  JsonPerfDataWriter(ResultsDirectory& directory, std::string file_name, int results_version,
                     std::string perf_data_name)
      : directory_(directory),
        file_name_(std::move(file_name)),
        head_{{"version", results_version}, {"name", std::move(perf_data_name)}} {}

  void addKeyVariables(const MessageDict& variables) override { head_.merge(variables); }

  void addMetric(PerfMetric metric) override {
    if (!metrics_.empty()) metrics_ += ",\n";
    appendJson(metrics_, metricDict(metric));
  }

  void setTotalTime(double milliseconds, const std::vector<std::string>& metrics) override {
    MessageArray names(metrics.begin(), metrics.end());
    head_.set("total_time",
              MessageDict{{"unit", "ms"}, {"value", milliseconds}, {"metrics", std::move(names)}});
  }

  ResultsDirectory::Error write() override {
    head_.merge(hostFacts());
    auto opened = directory_.createFile(file_name_);
    if (!opened.file) return opened.error;
    auto error = opened.file->write(text());
    if (!error) error = opened.file->close();
    return error;
  }

 private:
  std::string text() const {
    std::string json;
    appendJson(json, head_);
    json.pop_back();  // the brace: the metrics go inside
    return json + ",\"metrics\":[\n" + metrics_ + "\n]}\n";
  }

  ResultsDirectory& directory_;
  const std::string file_name_;
  MessageDict head_;
  std::string metrics_;
};

}  // namespace

std::unique_ptr<PerfDataWriter> JsonPerfDataWriters::makeWriter(ResultsDirectory& directory,
                                                                std::string file_name, int results_version,
                                                                std::string perf_data_name) {
  return std::make_unique<JsonPerfDataWriter>(directory, std::move(file_name), results_version,
                                              std::move(perf_data_name));
}

}  // namespace tal
