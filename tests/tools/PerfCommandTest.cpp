#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/PerfCommand.h"

namespace tal::talctl {
namespace {

using ::testing::HasSubstr;

constexpr char kFirst[] = R"({"version":4,"test_name":"nightly","metrics":[
  {"name":"mix Total","unit":"ms","value":80.0,"count":4,"minimum":10.0,"maximum":30.0,
   "percentile_50":20.0,"percentile_95":30.0,"percentile_99":30.0},
  {"name":"rings","unit":"events","value":0}, {"name":"gone","unit":"ms","value":1}]})";
constexpr char kSecond[] = R"({"metrics":[{"name":"mix Total","unit":"ms","value":60.0},
  {"name":"rings","unit":"events","value":3}, {"name":"new","unit":"ms","value":2}]})";

TEST(PerfShow, ShowsOneFileWithItsStatistics) {
  EXPECT_EQ(perfText({"a.pdj"}, {kFirst}, std::nullopt),
            "a.pdj\n"
            "  test_name: nightly\n"
            "METRIC     VALUE   UNIT    COUNT  MIN     P50     P95     P99     MAX\n"
            "mix Total  80.000  ms      4      10.000  20.000  30.000  30.000  30.000\n"
            "rings      0.000   events  -      -       -       -       -       -\n"
            "gone       1.000   ms      -      -       -       -       -       -\n");
}

TEST(PerfShow, ShowsTwoFilesWithTheirChange) {
  const std::string text = perfText({"a", "b"}, {kFirst, kSecond}, std::nullopt);
  EXPECT_THAT(text, HasSubstr("METRIC     UNIT    FIRST   SECOND  CHANGE\n"
                              "mix Total  ms      80.000  60.000  -25.0 %\n"
                              "rings      events  0.000   3.000   -\n"
                              "gone       ms      1.000   -       -\n"
                              "new        ms      -       2.000   -\n"));
}

TEST(PerfShow, RefusesWhatIsNoPerformanceData) {
  for (const char* content : {"", "text", "[]", "{}", R"({"metrics":[{"name":"x"}]})", R"({"metrics":3})"}) {
    EXPECT_THROW(perfText({"a"}, {content}, std::nullopt), CommandFailure) << content;
  }
  EXPECT_THROW(perfText({}, {}, std::nullopt), UsageError);
  EXPECT_THROW(perfText({"a", "b", "c"}, {kFirst, kFirst, kFirst}, std::nullopt), UsageError);
}

}  // namespace
}  // namespace tal::talctl
