#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>
#include <vector>

#include "core/TalReportingUtility.h"
#include "tools/talctl/report/ReportTally.h"

namespace tal::talctl {
namespace {

using testing::ElementsAre;
using testing::Pair;

constexpr double kNoon = 1795262400;  // a whole hour
constexpr double kMinute = 60;

struct Event {
  const char* name;
  std::string payload;
  double at = kNoon;
};

ReportTally tallyOf(const std::vector<Event>& events) {
  ReportTally tally;
  for (const Event& event : events) {
    const auto name = parseReportedName(event.name);
    if (name) tally.add(*name, event.at, event.payload);
  }
  tally.finish();
  return tally;
}

std::string played(const std::string& seconds, const std::string& more = "") {
  return R"({"HostApplicationDisplayID":"a","active_devices":"d","RvSessionVolume":0.5,)"
         R"("RvSessionVolumeBucketed":"0.5","play_seconds":)" +
         seconds + more + "}";
}

const char* const kVolume = "org.vantle.alarms.Volume.Summary";

std::vector<std::pair<double, double>> timeLine(const ReportTally& tally) {
  std::vector<std::pair<double, double>> minutes;
  for (const auto& [slot, usage] : tally.slots()) {
    minutes.emplace_back((static_cast<double>(slot * kSlotSeconds) - kNoon) / kMinute,
                         usage.played_seconds / kMinute);
  }
  return minutes;
}

TEST(ReportedName, TellsWhatAReportNeeds) {
  const struct {
    const char* name;
    const char* meaning;  // kind, service, event
  } kCases[] = {{"org.vantle.longformaudio.Volume.Summary", "0 longformaudio Volume.Summary"},
                {"org.vantle.talsys.Volume.Summary", "0  Volume.Summary"},
                {"org.vantle.voxa.Input.Summary", "1 voxa Input.Summary"},
                {"org.vantle.test.Playback.Stop", "2 test Playback.Stop"},
                {"org.vantle.test.Record.Stop", "2 test Record.Stop"},
                {"org.vantle.alerts.IO.Error", "3 alerts IO.Error"},
                {"org.vantle.alerts.DSP_Error.Generic", "3 alerts DSP_Error.Generic"},
                {"org.vantle.alarms.Error.IssueDetector", "3 alarms Error.IssueDetector"},
                {"org.vantle.talsys.store.RowsGivenUp", "4  store.RowsGivenUp"},
                {"org.vantle.test.Setup.Stop", ""},
                {"org.vantle.test.Volume.Generic", ""},
                {"org.vantle.test.Session_Generic.Summary", ""},
                {"org.vantle.test.HearingHealth.Summary", ""},
                {"org.vantle.talsys.talreportingclientuptime", ""},
                {"com.other.test.Volume.Summary", ""},
                {"org.vantle.", ""},
                {"", ""}};
  for (const auto& expected : kCases) {
    std::ostringstream meaning;
    if (const auto name = parseReportedName(expected.name)) {
      meaning << static_cast<int>(name->kind) << ' ' << name->service << ' ' << name->event;
    }
    EXPECT_EQ(meaning.str(), expected.meaning) << expected.name;
  }
}

TEST(ReportTally, AddsUpWhoPlayedWhatWhereAndHowLoud) {
  const ReportTally tally = tallyOf({
      {kVolume,
       R"({"HostApplicationDisplayID":"x","active_devices":"Speaker","session_selected_format":"S16",)"
       R"("mFormatID":"raw","mChannelsPerFrame":2,"RvSessionVolume":0.4,)"
       R"("RvSessionVolumeBucketed":"0.375","play_seconds":30.0})"},
      {kVolume, R"({"HostApplicationDisplayID":"x","active_devices":["HDMI","USB"],"RvSessionVolume":1.0,)"
                R"("RvSessionVolumeBucketed":"1.0","play_seconds":10.0})"},
      {"org.vantle.voxa.Input.Summary", R"({"HostApplicationDisplayID":"x","active_devices":"Speaker",)"
                                        R"("inputrunning_seconds":5.5})"},
  });
  const Ranking applications = tally.applications().ranking(10);
  ASSERT_EQ(applications.rows.size(), 2);
  const auto [name, service] = ReportTally::applicationOf(applications.rows[0].name);
  EXPECT_THAT(std::pair(name, service), Pair("x", "alarms"));
  EXPECT_EQ(applications.rows[0].usage.played_seconds, 40);
  EXPECT_EQ(applications.rows[0].usage.stretches, 2);
  EXPECT_NEAR(applications.rows[0].usage.meanVolume(), 0.55, 1e-9);
  EXPECT_EQ(applications.rows[1].usage.recorded_seconds, 5.5);
  EXPECT_EQ(ReportTally::applicationOf(applications.rows[1].name).service, "voxa");

  const Ranking devices = tally.devices().ranking(10);
  ASSERT_EQ(devices.rows.size(), 2);
  EXPECT_EQ(devices.rows[0].name, "Speaker");
  EXPECT_EQ(devices.rows[0].usage.seconds(), 35.5);
  EXPECT_EQ(devices.rows[1].name, "HDMI, USB");
  EXPECT_EQ(tally.formats().ranking(10).rows[0].name, "S16, raw, 2 ch");
  EXPECT_EQ(tally.formats().ranking(10).rows[1].name, "unknown");
  EXPECT_EQ(tally.volumes()[6], 30);
  EXPECT_EQ(tally.volumes()[16], 10);
  EXPECT_EQ(TalReportingUtilityBucketNumberToStringVolumes.size(), kVolumeBucketCount);
}

TEST(ReportTally, PassesOverWhatCannotBe) {
  const struct {
    std::string payload;
    double seconds;
    std::uint64_t unreadable;
  } kCases[] = {{played("1.5"), 1.5, 0},
                {played("-1"), 0, 0},
                {played("\"1\""), 0, 0},
                {played("null"), 0, 0},
                {played("1e300"), 0, 0},
                {played("nan"), 0, 0},
                {played("[1]"), 0, 0},
                {"{}", 0, 0},
                {"", 0, 1},
                {"[]", 0, 1},
                {played("2") + "}", 0, 1},
                {R"({"play_seconds":3)", 0, 1},
                {R"({"play_seconds":3})", 3, 0}};
  for (const auto& expected : kCases) {
    const ReportTally tally = tallyOf({{kVolume, expected.payload}});
    EXPECT_EQ(tally.total().played_seconds, expected.seconds) << expected.payload;
    EXPECT_EQ(tally.unreadable(), expected.unreadable) << expected.payload;
  }
  for (const double at : {-1e18, 1e18, -5.0}) {
    EXPECT_EQ(tallyOf({{kVolume, played("60"), at}}).total().played_seconds, 60) << at;
  }
}

TEST(ReportTally, PlacesTheStretchesOfASessionBeforeItsStop) {
  const auto of_session = [](const char* minutes, int index, int count) {
    return Event{kVolume, played(std::string(minutes) + "0", ",\"msgidx\":" + std::to_string(index) +
                                                                 ",\"msgcnt\":" + std::to_string(count))};
  };
  // 10, 20 and 5 minutes that ended at noon, the last one last.
  EXPECT_THAT(timeLine(tallyOf({of_session("60", 1, 3), of_session("120", 2, 3), of_session("30", 3, 3)})),
              ElementsAre(Pair(-45, 5), Pair(-30, 15), Pair(-15, 15)))
      << "from 35 minutes before on, without a pause";
  EXPECT_THAT(timeLine(tallyOf({of_session("60", 1, 1), of_session("60", 1, 1)})), ElementsAre(Pair(-15, 20)))
      << "two sessions at once";
  EXPECT_THAT(timeLine(tallyOf({of_session("60", 1, 2)})), ElementsAre(Pair(-15, 10)))
      << "the last one is missing";
  Event cut_short = of_session("60", 1, 2);
  cut_short.at -= 60 * kMinute;
  EXPECT_THAT(timeLine(tallyOf({cut_short, of_session("60", 1, 1)})),
              ElementsAre(Pair(-75, 10), Pair(-15, 10)))
      << "and another session follows";
  EXPECT_THAT(timeLine(tallyOf({of_session("60", 0, 0)})), ElementsAre(Pair(-15, 10)))
      << "nothing is said of others";
}

TEST(ReportTally, CountsAnEpisodeOnceHoweverOftenItIsTold) {
  const Event overload{"org.vantle.alarms.IO.Error",
                       R"({"HostApplicationDisplayID":"a","issue_type":"overload"})"};
  const Event end{"org.vantle.alarms.Playback.Stop",
                  R"({"HostApplicationDisplayID":"a","xrun_episodes":2,"xrun_starved_seconds":0.25})"};
  for (const auto& events :
       {std::vector{overload, overload}, std::vector{end}, std::vector{overload, overload, end}}) {
    const ReportTally tally = tallyOf(events);
    EXPECT_EQ(tally.total().overloads(), 2);
    EXPECT_EQ(tally.total().errors, 0);
    EXPECT_TRUE(tally.errors().empty());
  }
  EXPECT_EQ(tallyOf({end}).total().starved_seconds, 0.25);
}

TEST(ReportTally, KeepsErrorsApart) {
  const ReportTally tally = tallyOf({
      {"org.vantle.alarms.Error.IssueDetector", R"({"HostApplicationDisplayID":"a","issue_type":"LowRMS"})",
       kNoon},
      {"org.vantle.alarms.Error.IssueDetector", R"({"HostApplicationDisplayID":"a","issue_type":"LowRMS"})",
       kNoon + 9},
      {"org.vantle.alarms.IO.Error", R"({"HostApplicationDisplayID":"a","issue_type":"Overload"})"},
      {"org.vantle.talsys.store.RowsGivenUp", R"({"rows":1200})"},
      {"org.vantle.talsys.store.RowsGivenUp", R"({"rows":34})"},
  });
  ASSERT_EQ(tally.errors().size(), 2);
  const ErrorCount& low = tally.errors().at({"Error.IssueDetector", "LowRMS", "a"});
  EXPECT_EQ(low.count, 2);
  EXPECT_EQ(low.last_at, kNoon + 9);
  EXPECT_EQ(tally.errors().at({"IO.Error", "Overload", "a"}).count, 1) << "case counts";
  EXPECT_EQ(tally.rowsGivenUp(), 1234);
}

TEST(Breakdown, RanksAndAddsUpTheRest) {
  Breakdown breakdown;
  for (int i = 0; i < 400; ++i) breakdown.of("n" + std::to_string(i)) += Usage{.played_seconds = i + 1.0};
  breakdown.of("troubled") += Usage{.errors = 3};
  const Ranking ranking = breakdown.ranking(3);
  ASSERT_EQ(ranking.rows.size(), 3);
  EXPECT_EQ(ranking.rows[0].name, "n399");
  EXPECT_EQ(ranking.other_count, 398);
  EXPECT_EQ(ranking.others.played_seconds, 400 * 401 / 2 - 400 - 399 - 398);
  EXPECT_EQ(ranking.others.errors, 3);
  EXPECT_EQ(breakdown.ranking(400).rows.size(), 401) << "a single other has its own name";
  EXPECT_EQ(breakdown.ranking(401).rows.back().name, "troubled");
}

TEST(Breakdown, LosesNothingPastItsMostNames) {
  Breakdown breakdown;
  Breakdown more;
  for (std::size_t i = 0; i < Breakdown::kMostNames + 10; ++i) {
    breakdown.of("a" + std::to_string(i)) += Usage{.played_seconds = 1};
    more.of("b" + std::to_string(i)) += Usage{.played_seconds = 1};
  }
  breakdown.merge(more);
  EXPECT_EQ(breakdown.total().played_seconds, 2 * (Breakdown::kMostNames + 10));
  const Ranking ranking = breakdown.ranking(5);
  EXPECT_EQ(ranking.others.played_seconds + 5, breakdown.total().played_seconds);
}

}  // namespace
}  // namespace tal::talctl
