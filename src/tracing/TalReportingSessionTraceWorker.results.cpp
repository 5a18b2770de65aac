// From a finished trace to a performance-data file.

#include "tracing/TalReportingSessionTraceWorker.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <filesystem>
#include <system_error>

#include "core/SafeFileName.h"
#include "core/TalReportingUtility.h"
#include "tracing/ProbeList.h"
#include "tracing/TraceConfiguration.h"

namespace tal {

namespace {

constexpr std::array<std::string_view, 2> kTimedSubsystems{"org.vantle.audio", "org.vantle.talsys"};
constexpr std::string_view kProjectName = "talsys";
constexpr std::string_view kTemporaryFile = "temp_perfdata.pdj";
// A longer list is a mistake: test clients write a few dozen probes.
constexpr std::size_t kMostProbeListBytes = std::size_t{1} << 20;

std::string_view kindName(MessageValue::Kind kind) {
  using Kind = MessageValue::Kind;
  switch (kind) {
    case Kind::kString:
      return "string";
    case Kind::kSigned:
    case Kind::kUnsigned:
      return "integer";
    case Kind::kDouble:
      return "real";
    case Kind::kBoolean:
      return "boolean";
    case Kind::kDate:
      return "date";
    case Kind::kData:
      return "data";
    case Kind::kArray:
      return "array";
    case Kind::kDict:
      return "dict";
  }
  return "unknown";
}

template <typename Class, typename LookUp>
Class* lookedUpOnce(std::optional<Class*>& cached, LookUp look_up) {
  if (!cached) cached = look_up();
  return *cached;
}

bool isPlainFileName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

}  // namespace

SkeinTraceModelClass* SkeinClasses::traceModel() {
  return lookedUpOnce(trace_model_, [this] { return library_.traceModelClass(); });
}
SkeinSignpostModelClass* SkeinClasses::signpostModel() {
  return lookedUpOnce(signpost_model_, [this] { return library_.signpostModelClass(); });
}
SkeinProbeFactoryClass* SkeinClasses::probeFactory() {
  return lookedUpOnce(probe_factory_, [this] { return library_.probeFactoryClass(); });
}

void TalReportingSessionTraceWorker::processTraceSkein(const std::string& trace_url) {
  std::error_code ignored;
  if (trace_url.empty() || !std::filesystem::exists(trace_url, ignored)) {
    TAL_LOG_ERROR(log(), "No traceResults at path: ", trace_url);
    return;
  }
  TAL_LOG(log(), "Starting Skein Process Trace. Path: ", trace_url);
  const std::vector<SkeinProbeDescription> descriptions = collectProbes();
  if (descriptions.empty()) return;
  const auto trace_model = makeTraceModel(trace_url);
  if (!trace_model || !createPDWriter()) return;

  const auto signposts = makeSignpostModel(*trace_model);
  if (!signposts) return dropWriter();
  processSignposts(*signposts);
  if (SkeinProbeFactoryClass* factory = skein_.probeFactory()) {
    for (const auto& probe : factory->probesWithDescriptions(descriptions, *trace_model)) {
      processProbe(*probe);
    }
  }
  writeResults();
}

ClientFiles::Contents TalReportingSessionTraceWorker::readProbeList() const {
  return tracing_.client_files.read(session_.clientIdentity(), configured(kSkeinPlistFilePathKey),
                                    kMostProbeListBytes);
}

std::vector<SkeinProbeDescription> TalReportingSessionTraceWorker::collectProbes() {
  const std::string path = configured(kSkeinPlistFilePathKey);
  auto contents = readProbeList();
  PropertyLists::Result list{.value = std::nullopt, .error = std::move(contents.error)};
  if (contents.bytes) list = tracing_.property_lists.valueFromXml(*contents.bytes);
  if (!list.value) {
    TAL_LOG_ERROR(log(), "TalReportingSessionTraceWorker (", list.error, ") failed to get SkeinProbes from ",
                  path);
    return {};
  }
  MessageArray entries;
  if (const MessageArray* array = list.value->array()) {
    entries = *array;
  } else if (list.value->dict()) {
    entries.push_back(*list.value);
  } else {
    TAL_LOG_ERROR(log(), "unsupported root class ", kindName(list.value->kind()));
    return {};
  }
  std::vector<SkeinProbeDescription> descriptions;
  const std::vector<std::string> processes = perfProcesses();
  for (std::size_t i = 0; i < entries.size(); ++i) {
    ParsedProbe probe = parseProbe(entries[i], processes);
    if (probe.description) {
      descriptions.push_back(std::move(*probe.description));
    } else {
      TAL_LOG_ERROR(log(), "skipping entry ", i, " of the probe list ", path, ": ", probe.error);
    }
  }
  return descriptions;
}

std::vector<std::string> TalReportingSessionTraceWorker::perfProcesses() const {
  const MessageValue* value = session_.configuration().find(kPerfProcessesKey);
  if (!value) return {};
  auto names = stringList(*value);
  if (names) return std::move(*names);
  TAL_LOG_ERROR(log(), "ignoring TalReportingPerfProcesses: no list of names");
  return {};
}

std::unique_ptr<SkeinTraceModel> TalReportingSessionTraceWorker::makeTraceModel(
    const std::string& trace_url) {
  tracing_.skein.acknowledge();
  SkeinTraceModelClass* model_class = skein_.traceModel();
  if (!model_class) {
    TAL_LOG_ERROR(log(), "failed to create Skein model: the library is not there");
    return nullptr;
  }
  auto result = model_class->modelWithTrace(trace_url);
  if (!result.model) {
    TAL_LOG_ERROR(log(), "failed to create Skein model: ", result.error);
  } else if (const std::uint64_t discarded = result.model->discardedEventCount()) {
    TAL_LOG_ERROR(log(), "the trace lacks ", discarded,
                  " events that the tracer had no room for: ", trace_url);
  }
  return std::move(result.model);
}

std::unique_ptr<SkeinSignpostModel> TalReportingSessionTraceWorker::makeSignpostModel(
    const SkeinTraceModel& trace_model) {
  SkeinResult<SkeinSignpostModel> result{.model = nullptr, .error = "the library has no such class"};
  if (SkeinSignpostModelClass* model_class = skein_.signpostModel()) {
    result = model_class->modelWithTraceModel(trace_model);
  }
  if (!result.model) TAL_LOG_ERROR(log(), "failed to create Skein signpost model: ", result.error);
  return std::move(result.model);
}

bool TalReportingSessionTraceWorker::createPDWriter() {
  const Platform& platform = session_.platform();
  std::string directory = configured(kSkeinOutputFileDirectoryKey);
  ClientFiles::OpenedDirectory opened;
  if (!directory.empty()) {
    opened = tracing_.client_files.openDirectory(session_.clientIdentity(), directory);
  } else {
    directory = platform.diagnostic_log.pathOf(TalReportingTraceLogsDirectory);
    if (auto error = platform.diagnostic_log.makeDirectory(TalReportingTraceLogsDirectory)) {
      opened.error = std::move(*error);
    } else {
      opened = tracing_.client_files.openDiagnosticDirectory(TalReportingTraceLogsDirectory);
    }
  }
  if (!opened.directory) {
    TAL_LOG_ERROR(log(), "can't create logging directory at ", directory, ": ", opened.error);
    return false;
  }
  output_file_ = outputFileName();
  if (!isPlainFileName(output_file_)) {
    TAL_LOG_ERROR(log(), "TalReportingSkeinOutputFileName is no plain file name: ", output_file_);
    return false;
  }
  if (directory.back() != '/') directory += '/';
  full_writer_path_ = directory + output_file_;
  temp_writer_path_ = directory;
  temp_writer_path_ += kTemporaryFile;
  TAL_LOG_DEBUG(log(), "tempWriterPath: ", temp_writer_path_);
  results_directory_ = std::move(opened.directory);
  writer_ = tracing_.perf_data.makeWriter(*results_directory_, std::string(kTemporaryFile), kResultsVersion,
                                          perf_data_name_);
  return true;
}

std::string TalReportingSessionTraceWorker::outputFileName() const {
  if (session_.configuration().contains(kSkeinOutputFileNameKey)) return configured(kSkeinOutputFileNameKey);
  std::string name = session_.platform().clock.localTimeForFileName();
  name += '-';
  name += kProjectName;
  name += '-';
  name += safeInFileName(TalReportingUtilityRetrieveAppName(session_.configuration()).text());
  name += '-';
  name += session_.serviceName();
  return name + ".pdj";
}

void TalReportingSessionTraceWorker::processSignposts(const SkeinSignpostModel& signpost_model) {
  // In the order in which the names appear.
  std::vector<std::pair<std::string_view, PerfSeries>> series;
  std::map<std::string_view, std::size_t> index;
  for (const SkeinSignpost& signpost : signpost_model.signposts()) {
    if (std::find(kTimedSubsystems.begin(), kTimedSubsystems.end(), signpost.subsystem) ==
        kTimedSubsystems.end()) {
      continue;
    }
    TAL_LOG_DEBUG(log(), "name:", signpost.name, " time:", signpost.milliseconds, " ms");
    const auto [found, is_new] = index.try_emplace(signpost.name, series.size());
    if (is_new) series.emplace_back(signpost.name, PerfSeries{});
    series[found->second].second.add(signpost.milliseconds);
  }
  if (const std::uint64_t unpaired = signpost_model.unpairedCount()) {
    TAL_LOG(log(), "signposts without their begin or end: ", unpaired);
  }
  for (const auto& [name, samples] : series) {
    const std::string text(name);
    total_time_value_ += addTimeMetrics(*writer_, text, samples);
    total_time_metrics_.push_back(totalMetricName(text));
  }
}

void TalReportingSessionTraceWorker::processProbe(const SkeinProbe& probe) {
  const SkeinProbeDescription& description = probe.description();
  if (!probe.shortcoming().empty()) {
    TAL_LOG_ERROR(log(), "skipping probe ", description.name, ": ", probe.shortcoming());
    return;
  }
  for (const SkeinProbe::Series& series : probe.series()) {
    if (description.kind == SkeinProbeDescription::Kind::kCount) {
      const auto count = static_cast<double>(series.count);
      writer_->addMetric({.name = series.name, .unit = "events", .value = count, .samples = {}});
    } else {
      addTimeMetrics(*writer_, series.name, PerfSeries(series.milliseconds));
    }
  }
}

void TalReportingSessionTraceWorker::writeResults() {
  if (const MessageValue* test_name = session_.configuration().find(kTestNameKey)) {
    key_variables_.set("test_name", test_name->text());
  }
  writer_->addKeyVariables(key_variables_);
  if (!total_time_metrics_.empty()) writer_->setTotalTime(total_time_value_, total_time_metrics_);
  if (const auto error = writer_->write()) {
    TAL_LOG_ERROR(log(), "Failed to write file ", temp_writer_path_, ": ", *error);
  } else {
    TAL_LOG(log(), "Moving file from tempWriterPath: ", temp_writer_path_, " to ", full_writer_path_);
    if (const auto move_error = results_directory_->move(kTemporaryFile, output_file_)) {
      TAL_LOG_ERROR(log(), "Failed to move file");
      TAL_LOG(log(), "moving ", full_writer_path_, " into place: ", *move_error);
    }
  }
  dropWriter();
}

void TalReportingSessionTraceWorker::dropWriter() {
  writer_.reset();
  results_directory_.reset();
  total_time_value_ = 0;
  total_time_metrics_.clear();
}

}  // namespace tal
