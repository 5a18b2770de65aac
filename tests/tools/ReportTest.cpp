// A report as a whole: from a store to what is read.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/TemporaryDirectory.h"
#include "tools/StoreFile.h"
#include "tools/talctl/report/ReportHtml.h"
#include "tools/talctl/report/ReportText.h"
#include "tools/talctl/report/ReportWords.h"

namespace tal::talctl {
namespace {

using testing::HasSubstr;
using testing::Not;

constexpr double kNoon = 1795262400;
constexpr double kDay = 86400;

class ReportOfAStore : public testing::Test {
 protected:
  void addPlaying(double at, const std::string& service, const std::string& application, double seconds) {
    store_.add(at, "org.vantle." + service + ".Volume.Summary",
               R"({"HostApplicationDisplayID":")" + application +
                   R"(","RvSessionVolume":0.5,"play_seconds":)" + std::to_string(seconds) + "}");
  }
  AudioReport report(std::optional<double> since = {}, const ReportLimits& limits = {}) {
    return makeReport(readStore(path_, since), since, kNoon, limits);
  }

  const test::TemporaryDirectory directory_;
  const std::filesystem::path path_ = directory_.path() / "store.db";
  StoreFile store_{path_};
  const Terminal pipe_{false, false};
};

TEST_F(ReportOfAStore, CountsAMessageOnceUnderWhicheverOfItsTwoNamesItIsStored) {
  addPlaying(kNoon, "talsys", "both", 10);
  addPlaying(kNoon, "alarms", "both", 10);
  store_.add(kNoon, "org.vantle.talsys.Input.Summary",
             R"({"HostApplicationDisplayID":"general only","inputrunning_seconds":7})");
  const AudioReport both = report();
  EXPECT_EQ(both.total.played_seconds, 10);
  EXPECT_EQ(both.total.recorded_seconds, 7);
  EXPECT_EQ(both.events, 3);
}

TEST_F(ReportOfAStore, IsTheSameOnSeveralThreads) {
  constexpr int kEvents = 70000;
  store_.execute("BEGIN");
  for (int i = 0; i < kEvents; ++i) addPlaying(kNoon - i, "alarms", "a" + std::to_string(i % 7), 1);
  store_.execute("COMMIT");
  store_.execute("DELETE FROM events WHERE id <= 10");
  const AudioReport all = report();
  EXPECT_EQ(all.total.stretches, kEvents - 10);
  EXPECT_EQ(all.total.played_seconds, kEvents - 10);
  EXPECT_EQ(all.applications.rows.size(), 7);
  EXPECT_EQ(report(kNoon - 99).total.stretches, 90);
}

TEST_F(ReportOfAStore, ShowsDaysInARowWithTheEarlierOnesTogether) {
  addPlaying(kNoon - 40 * kDay, "alarms", "a", 100);
  addPlaying(kNoon - 3 * kDay, "alarms", "a", 200);
  addPlaying(kNoon - 1 * kDay, "alarms", "a", 300);
  const AudioReport all = report();
  ASSERT_EQ(all.days.size(), 31);
  EXPECT_EQ(all.earlier.played_seconds, 100);
  EXPECT_EQ(all.days[27].usage.played_seconds, 200);
  EXPECT_EQ(all.days[28].usage.played_seconds, 0);
  EXPECT_EQ(all.days[29].usage.played_seconds, 300);
  EXPECT_EQ(report(kNoon - 5 * kDay).days.size(), 6) << "from the first day asked for, though it is empty";
}

TEST_F(ReportOfAStore, SaysWhyThereIsNothing) {
  EXPECT_THAT(reportText(report(), pipe_), HasSubstr("Nothing was stored"));
  store_.add(kNoon, "org.vantle.test.Setup.Setup", "{}");
  EXPECT_THAT(reportText(report(), pipe_), HasSubstr("Nothing was played or recorded"));
  EXPECT_THAT(reportHtml(report(kNoon + 1)), HasSubstr("Nothing was stored"));
  store_.execute("DROP TABLE events");
  EXPECT_THAT(reportText(report(), pipe_), HasSubstr("Nothing was stored"));
}

TEST_F(ReportOfAStore, ShowsStrangeNamesAsTheyAreAndHarmless) {
  addPlaying(kNoon, "a<b>", R"(<img src=x onerror=\"x\">&amp;\u001b[2J\u202e)", 10);
  const std::string html = reportHtml(report());
  EXPECT_THAT(html, HasSubstr(R"(&lt;img src=x onerror=&quot;x&quot;&gt;&amp;amp;\u001b[2J\u202e)"));
  EXPECT_THAT(html, HasSubstr("a&lt;b&gt;"));
  EXPECT_THAT(html, Not(HasSubstr("<img")));
  EXPECT_THAT(reportText(report(), pipe_), HasSubstr(R"(<img src=x onerror="x">&amp;\u001b[2J\u202e)"));
}

TEST(ReportWords, AreShortAndClear) {
  const std::pair<double, const char*> kDurations[] = {{0, "–"},
                                                       {-1, "–"},
                                                       {0.04, "0.0 s"},
                                                       {4.04, "4.0 s"},
                                                       {9.96, "10 s"},
                                                       {59.4, "59 s"},
                                                       {59.6, "1 min 00 s"},
                                                       {125, "2 min 05 s"},
                                                       {3599.6, "1 h 00 min"},
                                                       {7500, "2 h 05 min"},
                                                       {360000, "100 h"},
                                                       {4.5e6, "1,250 h"}};
  for (const auto& [seconds, text] : kDurations) EXPECT_EQ(durationText(seconds), text) << seconds;
  EXPECT_EQ(numberText(1234567), "1,234,567");
  EXPECT_EQ(numberText(123), "123");
  EXPECT_EQ(percentText(0.374), "37 %");
  EXPECT_EQ(shareText(0.004), "<1 %");
  EXPECT_EQ(shareText(0), "0 %");
  EXPECT_EQ(countText(1, "error", "errors"), "1 error");
}

}  // namespace
}  // namespace tal::talctl
