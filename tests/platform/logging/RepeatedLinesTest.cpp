#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/HostFakes.h"
#include "platform/linux/logging/RepeatedLines.h"
#include "support/HandDriven.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

constexpr auto kShown = RepeatedLines::kShownPerSecond;

class Forward final : public LogSink {
 public:
  explicit Forward(LogSink& to) : to_(to) {}
  void write(std::string_view channel, LogLevel level, std::string_view line) override {
    to_.write(channel, level, line);
  }

 private:
  LogSink& to_;
};

class RepeatedLinesTest : public ::testing::Test {
 protected:
  void write(std::uint64_t times, std::string_view line, LogLevel level = LogLevel::kDefault,
             std::string_view channel = "talri") {
    for (std::uint64_t i = 0; i < times; ++i) lines->write(channel, level, line);
  }
  std::vector<std::string> behind() const { return sink.lines(); }

  test::RecordingLogSink sink;
  test::HandClock clock;
  std::unique_ptr<RepeatedLines> lines =
      std::make_unique<RepeatedLines>(std::make_unique<Forward>(sink), clock);
};

TEST_F(RepeatedLinesTest, HidesWhatAFloodRepeatsAndTellsHowMuchBeforeTheNextLine) {
  write(kShown + 3, "a");
  EXPECT_EQ(behind().size(), kShown);
  write(1, "b");
  ASSERT_EQ(behind().size(), kShown + 2);
  EXPECT_EQ(behind()[kShown], "default: a (3 more of these)");
  EXPECT_EQ(behind()[kShown + 1], "default: b");
  write(1, "a");
  EXPECT_EQ(behind().back(), "default: a") << "a line between two makes them no repeats";
}

TEST_F(RepeatedLinesTest, EachSecondShowsSome) {
  write(kShown + 5, "a");
  clock.advance(1s);
  write(1, "a");
  EXPECT_EQ(behind()[kShown], "default: a (5 more of these)");
  EXPECT_EQ(behind().size(), kShown + 2);
  write(kShown, "a");
  EXPECT_EQ(behind().size(), kShown + 2 + kShown - 1);
}

TEST_F(RepeatedLinesTest, AnotherLevelOrChannelIsAnotherLine) {
  write(kShown, "a");
  write(1, "a", LogLevel::kError);
  write(1, "a", LogLevel::kError, "talrs");
  EXPECT_EQ(behind().size(), kShown + 2);
}

TEST_F(RepeatedLinesTest, TheEndTellsWhatWasHidden) {
  write(kShown + 1, "a");
  lines.reset();
  EXPECT_EQ(behind().back(), "default: a (1 more of these)");
}

}  // namespace
}  // namespace tal
