#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "platform/HostFakes.h"
#include "platform/linux/logging/LogRing.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::Not;

TEST(LogRing, KeepsAllLevelsAndPassesOnThoseAskedFor) {
  test::RecordingLogSink behind;
  LogRing ring(behind, LogLevel::kDefault);
  ring.write("talrs", LogLevel::kDebug, "details");
  ring.write("talrs", LogLevel::kDefault, "news");
  ring.write("talrs", LogLevel::kError, "trouble");
  EXPECT_THAT(behind.lines(), ElementsAre("default: news", "error: trouble"));
  const std::string text = ring.text();
  EXPECT_THAT(text, HasSubstr("Z talrs debug   details\n"));
  EXPECT_LT(text.find("details"), text.find("trouble"));
}

TEST(LogRing, HoldsTheNewestLinesAndTheBeginningOfLongOnes) {
  test::RecordingLogSink behind;
  LogRing ring(behind, LogLevel::kError);
  EXPECT_EQ(ring.text(), "");
  for (std::size_t i = 0; i < LogRing::kLines + 60; ++i) {
    ring.write("talrs", LogLevel::kDebug, "line " + std::to_string(i) + ";");
  }
  const std::string text = ring.text();
  EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), static_cast<std::ptrdiff_t>(LogRing::kLines));
  EXPECT_THAT(text, Not(HasSubstr("line 59;")));
  EXPECT_LT(text.find("line 60;"), text.find("line 2059;"));
  ring.write("talrs", LogLevel::kDebug, std::string(1 << 20, 'x'));
  EXPECT_LT(ring.text().size(), text.size() + LogRing::kMostLineBytes);
}

}  // namespace
}  // namespace tal
