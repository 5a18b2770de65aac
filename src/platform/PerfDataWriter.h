#pragma once

// Files of performance data.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageDict.h"
#include "platform/ClientFiles.h"

namespace tal {

/// What a set of samples looks like. Percentiles are of the nearest rank.
struct PerfStatistics {
  std::uint64_t count = 0;
  double minimum = 0;
  double maximum = 0;
  double percentile_50 = 0;
  double percentile_95 = 0;
  double percentile_99 = 0;
};

struct PerfMetric {
  std::string name = {};
  std::string_view unit = {};  ///< a literal
  double value = 0;
  PerfStatistics samples = {};
};

/// One file in the making. One thread.
class PerfDataWriter {
 public:
  virtual ~PerfDataWriter() = default;

  /// Entries that stand beside the metrics, such as the test's name.
  virtual void addKeyVariables(const MessageDict& variables) = 0;
  virtual void addMetric(PerfMetric metric) = 0;
  /// The time that `metrics`, by name, make up together.
  virtual void setTotalTime(double milliseconds, const std::vector<std::string>& metrics) = 0;
  /// Writes the file, replacing one of its name.
  virtual ResultsDirectory::Error write() = 0;
};

class PerfDataWriters {
 public:
  virtual ~PerfDataWriters() = default;

  /// For a file of that name in the directory, which outlives the writer.
  virtual std::unique_ptr<PerfDataWriter> makeWriter(ResultsDirectory& directory, std::string file_name,
                                                     int results_version, std::string perf_data_name) = 0;
};

}  // namespace tal
