// The entry of the trace-model library: its classes by their names.

#include <cstdlib>
#include <exception>
#include <string_view>

#include "platform/linux/skein/Probes.h"
#include "platform/linux/skein/SignpostPairs.h"
#include "platform/linux/skein/TraceReader.h"
#include "platform/linux/tracing/SkeinLibraryEntry.h"

namespace tal {

namespace {

bool isAcknowledged() {
  const char* value = std::getenv(kSkeinAcknowledgement);
  return value && std::string_view(value) == "1";
}

class TraceModelClass final : public SkeinTraceModelClass {
  SkeinResult<SkeinTraceModel> modelWithTrace(const std::string& trace_url) override {
    if (!isAcknowledged()) return {nullptr, std::string(kSkeinAcknowledgement) + " is not set to 1"};
    try {
      auto result = readTrace(trace_url);
      return {std::move(result.model), std::move(result.error)};
    } catch (const std::exception& failure) {  // no memory for it
      return {nullptr, failure.what()};
    }
  }
};

// All models of this library are made by the class above.
const TraceContent& contentOf(const SkeinTraceModel& trace) {
  return static_cast<const TraceContent&>(trace);
}

class SignpostModelClass final : public SkeinSignpostModelClass {
  SkeinResult<SkeinSignpostModel> modelWithTraceModel(const SkeinTraceModel& trace) override {
    try {
      return {std::make_unique<SignpostPairs>(contentOf(trace)), ""};
    } catch (const std::exception& failure) {
      return {nullptr, failure.what()};
    }
  }
};

class ProbeFactoryClass final : public SkeinProbeFactoryClass {
  std::vector<std::unique_ptr<SkeinProbe>> probesWithDescriptions(
      const std::vector<SkeinProbeDescription>& descriptions, const SkeinTraceModel& trace) override {
    std::vector<std::unique_ptr<SkeinProbe>> probes;
    probes.reserve(descriptions.size());
    for (const auto& description : descriptions) probes.push_back(makeProbe(description, contentOf(trace)));
    return probes;
  }
};

}  // namespace

extern "C" __attribute__((visibility("default"))) void* talreporting_skein_class_1(const char* class_name) {
  static TraceModelClass trace_model;
  static SignpostModelClass signpost_model;
  static ProbeFactoryClass probe_factory;
  const std::string_view name(class_name);
  // As the base that the caller casts to.
  if (name == kSkeinTraceModelClassName) return static_cast<SkeinTraceModelClass*>(&trace_model);
  if (name == kSkeinSignpostModelClassName) return static_cast<SkeinSignpostModelClass*>(&signpost_model);
  if (name == kSkeinProbeFactoryClassName) return static_cast<SkeinProbeFactoryClass*>(&probe_factory);
  return nullptr;
}

}  // namespace tal
