#include <gtest/gtest.h>

#include "tracing/PerfSeries.h"

namespace tal {
namespace {

TEST(PerfSeries, PercentilesAreOfTheNearestRank) {
  PerfSeries series;
  for (int i = 200; i >= 1; --i) series.add(i);
  const PerfStatistics statistics = series.statistics();
  EXPECT_EQ(statistics.count, 200U);
  EXPECT_EQ(statistics.minimum, 1);
  EXPECT_EQ(statistics.maximum, 200);
  EXPECT_EQ(statistics.percentile_50, 100);
  EXPECT_EQ(statistics.percentile_95, 190);
  EXPECT_EQ(statistics.percentile_99, 198);

  const PerfStatistics of_one = PerfSeries({7}).statistics();
  EXPECT_EQ(of_one.percentile_50, 7);
  EXPECT_EQ(of_one.percentile_99, 7);
  EXPECT_EQ(PerfSeries().statistics().count, 0U);
}

}  // namespace
}  // namespace tal
