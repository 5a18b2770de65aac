#pragma once

// Reading of finished traces: the classes of an optional library, which is
// loaded when the first trace is read. These headers are all that library and
// daemon share; a change to them is a new name of the library's entry.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// A model, or why there is none.
template <typename Model>
struct SkeinResult {
  std::unique_ptr<Model> model = nullptr;
  std::string error = {};
};

/// The content of one trace. One thread.
class SkeinTraceModel {
 public:
  virtual ~SkeinTraceModel() = default;

  virtual std::uint64_t eventCount() const = 0;
  /// Events that the tracer had no room for.
  virtual std::uint64_t discardedEventCount() const = 0;
};

/// A pair of begin and end. The texts live as long as the model that they are of.
struct SkeinSignpost {
  std::string_view subsystem;
  std::string_view name;
  double milliseconds = 0;
};

class SkeinSignpostModel {
 public:
  virtual ~SkeinSignpostModel() = default;

  /// In the order of their ends.
  virtual const std::vector<SkeinSignpost>& signposts() const = 0;
  /// Begins without an end and ends without a begin.
  virtual std::uint64_t unpairedCount() const = 0;
};

/// One entry of a probe list.
struct SkeinProbeDescription {
  enum class Kind { kInterval, kCount, kCpu };

  std::string name = {};
  Kind kind = Kind::kInterval;
  std::string begin = {};                   ///< kInterval: an event's name
  std::string end = {};                     ///< kInterval: an event's name
  std::vector<std::string> events = {};     ///< kCount: events' names
  std::vector<std::string> processes = {};  ///< Names; empty: all
};

/// What one probe measured.
class SkeinProbe {
 public:
  /// One line of the results: times in milliseconds, or a number of events.
  struct Series {
    std::string name = {};
    std::vector<double> milliseconds = {};
    std::uint64_t count = 0;
  };

  virtual ~SkeinProbe() = default;

  virtual const SkeinProbeDescription& description() const = 0;
  /// kInterval: one series. kCount: one for each event name. kCpu: one for each
  /// process, of its stretches on a processor.
  virtual const std::vector<Series>& series() const = 0;
  /// What the trace lacked for this probe; empty mostly.
  virtual std::string_view shortcoming() const = 0;
};

// The library's classes. They live as long as the process.

class SkeinTraceModelClass {
 public:
  virtual ~SkeinTraceModelClass() = default;
  /// Of the trace at the location. Reads all of it.
  virtual SkeinResult<SkeinTraceModel> modelWithTrace(const std::string& trace_url) = 0;
};

class SkeinSignpostModelClass {
 public:
  virtual ~SkeinSignpostModelClass() = default;
  /// `trace` outlives the result.
  virtual SkeinResult<SkeinSignpostModel> modelWithTraceModel(const SkeinTraceModel& trace) = 0;
};

class SkeinProbeFactoryClass {
 public:
  virtual ~SkeinProbeFactoryClass() = default;
  /// In the order of the descriptions.
  virtual std::vector<std::unique_ptr<SkeinProbe>> probesWithDescriptions(
      const std::vector<SkeinProbeDescription>& descriptions, const SkeinTraceModel& trace) = 0;
};

/// The library itself. Called on the reporting queue.
class SkeinLibrary {
 public:
  virtual ~SkeinLibrary() = default;

  /// The classes of these names, or null where the library is absent.
  virtual SkeinTraceModelClass* traceModelClass() = 0;
  virtual SkeinSignpostModelClass* signpostModelClass() = 0;
  virtual SkeinProbeFactoryClass* probeFactoryClass() = 0;

  /// Sets the environment variable without which the library refuses to work.
  virtual void acknowledge() = 0;
};

}  // namespace tal
