#pragma once

// Samples of one measure, and what is told of them.

#include <string>
#include <vector>

#include "platform/PerfDataWriter.h"

namespace tal {

/// Durations in milliseconds under one name.
class PerfSeries {
 public:
  explicit PerfSeries(std::vector<double> samples = {}) : samples_(std::move(samples)) {}

  void add(double milliseconds) { samples_.push_back(milliseconds); }
  bool empty() const { return samples_.empty(); }

  /// Zeros for no samples.
  PerfStatistics statistics() const;
  double total() const;

 private:
  std::vector<double> samples_;
};

/// The names of a series' two metrics.
std::string totalMetricName(const std::string& name);
std::string averageMetricName(const std::string& name);

/// Writes "<name> Total" and "<name> AVG" of samples in milliseconds, each with
/// the statistics of the samples; answers the total.
double addTimeMetrics(PerfDataWriter& writer, const std::string& name, const PerfSeries& series);

}  // namespace tal
