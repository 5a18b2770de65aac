#include "tracing/PerfSeries.h"

#include <algorithm>
#include <cmath>
#include <numeric>

namespace tal {

namespace {

// Nearest rank: the smallest sample that at least so much of all samples do not exceed.
double percentile(const std::vector<double>& sorted, double percent) {
  const double rank = std::ceil(percent / 100.0 * static_cast<double>(sorted.size()));
  return sorted[static_cast<std::size_t>(std::max(rank, 1.0)) - 1];
}

}  // namespace

PerfStatistics PerfSeries::statistics() const {
  if (samples_.empty()) return {};
  std::vector<double> sorted = samples_;
  std::sort(sorted.begin(), sorted.end());
  return {.count = sorted.size(),
          .minimum = sorted.front(),
          .maximum = sorted.back(),
          .percentile_50 = percentile(sorted, 50),
          .percentile_95 = percentile(sorted, 95),
          .percentile_99 = percentile(sorted, 99)};
}

double PerfSeries::total() const { return std::accumulate(samples_.begin(), samples_.end(), 0.0); }

std::string totalMetricName(const std::string& name) { return name + " Total"; }
std::string averageMetricName(const std::string& name) { return name + " AVG"; }

double addTimeMetrics(PerfDataWriter& writer, const std::string& name, const PerfSeries& series) {
  constexpr std::string_view kUnit = "ms";
  const double total = series.total();
  const PerfStatistics statistics = series.statistics();
  const double average = series.empty() ? 0 : total / static_cast<double>(statistics.count);
  writer.addMetric({.name = totalMetricName(name), .unit = kUnit, .value = total, .samples = statistics});
  writer.addMetric({.name = averageMetricName(name), .unit = kUnit, .value = average, .samples = statistics});
  return total;
}

}  // namespace tal
