#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "support/FakeTracing.h"
#include "support/SessionFixture.h"
#include "tracing/TalReportingSessionTraceWorker.h"

namespace tal {
namespace {

using namespace std::chrono_literals;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr char kPlist[] = "TalReportingSkeinPlistFilePath";
// A place that exists, as a finished trace does.
constexpr char kTracePlace[] = "/";

class TraceWorker : public test::SessionFixture {
 protected:
  TraceWorker() {
    tracing.results.files["/probes.plist"] = "good";
    tracing.lists.values["good"] = MessageDict{{"name", "ring"}, {"kind", "count"}, {"events", "a:b"}};
    tracing.skein.series["ring"] = {{.name = "ring a:b", .milliseconds = {}, .count = 3}};
    host.platform.internal_build = true;
  }

  TalReportingSession& makeTestSession(const MessageDict& extra = {}) {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionTraceWorkerClass>(tracing.platform));
    makeSession(std::move(classes));
    session().setServiceType(AudioServiceType::kTest);
    session().updateConfigurationWithContentsOfConfiguration(MessageDict{{kPlist, "/probes.plist"}});
    session().updateConfigurationWithContentsOfConfiguration(extra);
    return session();
  }

  auto didStart(PerftrailDelegate::Error error = std::nullopt) {
    return [this, error] { tracing.perftrail.delegate()->perftrailDidStart(error); };
  }
  auto didComplete(std::string url = kTracePlace, PerftrailDelegate::Error error = std::nullopt) {
    return [this, url, error] { tracing.perftrail.delegate()->perftrailDidComplete(url, "token", error); };
  }
  /// A session from start to stop, with what happens while the worker waits.
  void runSession(std::vector<std::function<void()>> during_waits, const MessageDict& extra = {}) {
    tracing.waits.during_waits = std::move(during_waits);
    makeTestSession(extra).start();
    session().stop();
  }
  bool wroteResults() const {
    const auto& calls = tracing.results.calls;
    return std::find(calls.begin(), calls.end(), "write") != calls.end();
  }
  const std::vector<std::string>& perftrailCalls() const { return tracing.perftrail.state->calls; }

  test::FakeTracing tracing;
};

TEST_F(TraceWorker, RecordsFromStartToStopAndMovesTheFinishedFileIntoPlace) {
  tracing.skein.signposts = {{"org.vantle.audio", "decode", 2},
                             {"org.example", "ours not", 100},
                             {"org.vantle.talsys", "mix", 5},
                             {"org.vantle.audio", "decode", 4}};
  runSession({didStart(), didComplete()}, {{"HostApplicationDisplayID", "player/1"}});

  EXPECT_THAT(perftrailCalls(), ElementsAre("make 2", "start", "stop", "gone"));
  EXPECT_THAT(tracing.waits.waited, ElementsAre(15s, 180s));
  const std::string name = host.clock.localTimeForFileName() + "-talsys-player_1-test.pdj";
  EXPECT_THAT(tracing.results.calls,
              ElementsAre("directory Audio/Traces", "writer temp_perfdata.pdj 4 TalReporting", "write",
                          "move temp_perfdata.pdj " + name));
  EXPECT_THAT(host.diagnostic_log.directories, ElementsAre("Audio/Traces"));
  EXPECT_EQ(host.log.count("Moving file from tempWriterPath: /log/Audio/Traces/temp_perfdata.pdj to "
                           "/log/Audio/Traces/" +
                           name),
            1U);
  EXPECT_TRUE(host.log.holds("name:decode time:2.000000 ms"));

  const PerfMetric& total = tracing.results.metric("decode Total");
  EXPECT_EQ(total.value, 6);
  EXPECT_EQ(total.samples.count, 2U);
  EXPECT_EQ(tracing.results.metric("decode AVG").value, 3);
  EXPECT_EQ(tracing.results.metric("mix AVG").value, 5);
  EXPECT_EQ(tracing.results.metric("ring a:b").value, 3);
  EXPECT_EQ(tracing.results.metrics.size(), 5U) << "of two signposts and one count";
  EXPECT_EQ(tracing.results.total_time, 11);
}

TEST_F(TraceWorker, ConfigurationChoosesTemplateNamesAndDirectory) {
  runSession({didStart(), didComplete()}, {{"TalReportingTraceType", "sktrace_profile"},
                                           {"TalReportingSkeinOutputFileName", "nightly.pdj"},
                                           {"TalReportingSkeinOutputFileDirectory", "/results"},
                                           {"TalReportingTestName", "nightly run"}});
  EXPECT_EQ(perftrailCalls().front(), "make 3");
  EXPECT_THAT(tracing.results.calls,
              ElementsAre("directory /results", "writer temp_perfdata.pdj 4 nightly.pdj", "write",
                          "move temp_perfdata.pdj nightly.pdj"));
  EXPECT_EQ(tracing.results.variables.find("test_name")->string(), "nightly run");
}

TEST_F(TraceWorker, OnlyTestSessionsOnInternalBuildsAreTraced) {
  makeTestSession().setServiceType(AudioServiceType::kHaptics);
  session().start();
  host.platform.internal_build = false;
  makeTestSession().start();
  session().stop();
  EXPECT_THAT(perftrailCalls(), IsEmpty());
}

TEST_F(TraceWorker, RefusesToStartWithoutAProbeList) {
  makeTestSession({{kPlist, "/elsewhere"}}).start();
  EXPECT_THAT(perftrailCalls(), IsEmpty());
  EXPECT_EQ(host.log.count(
                "Could not start Perftrail. TalReportingSkeinPlistFilePath: /elsewhere is not a valid path"),
            1U);
  EXPECT_EQ(host.log.lines.back().channel, "talrr");
}

TEST_F(TraceWorker, AStartThatNobodyAnswersIsStoppedAndNotTriedAgain) {
  runSession({});
  EXPECT_EQ(host.log.count("timed out waiting for performance trace to start"), 1U);
  EXPECT_THAT(tracing.waits.waited, ElementsAre(15s));
  session().start();
  EXPECT_THAT(perftrailCalls(), ElementsAre("make 2", "start", "stop"));
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, AFailedStartCountsAsStartedAndLeavesNothingToStop) {
  runSession({didStart("no tracer")});
  EXPECT_EQ(host.log.count("perftrailDidStart no tracer"), 1U);
  EXPECT_TRUE(host.log.holds("action=start worker=TalReportingSessionTraceWorker started=YES"));
  EXPECT_THAT(perftrailCalls(), ElementsAre("make 2", "start", "gone"));
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, ATraceThatIsNeverCompleteLeavesNoResults) {
  runSession({didStart()});
  EXPECT_EQ(
      host.log.count("timed out waiting for performance trace to stop.  No pdj file wil be generated. "), 1U);
  EXPECT_FALSE(wroteResults());

  // The late answer of the old trace must not pass for an answer of the next one.
  tracing.perftrail.delegate()->perftrailDidComplete(kTracePlace, "token", std::nullopt);
  tracing.waits.during_waits = {didStart(), didComplete("/nowhere at all")};
  session().start();
  session().stop();
  EXPECT_EQ(host.log.count("No traceResults at path: /nowhere at all"), 1U);
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, AFailedTraceLeavesNoResults) {
  runSession({didStart(), didComplete("", "disk full")});
  EXPECT_EQ(host.log.count("perftrailDidComplete disk full"), 1U);
  EXPECT_EQ(host.log.count("No traceResults at path: "), 1U);
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, AFailedStopIsLoggedAndWaitedFor) {
  const auto did_stop = [this] { tracing.perftrail.delegate()->perftrailDidStop("busy"); };
  runSession({didStart(), did_stop});
  EXPECT_EQ(host.log.count("perftrailDidStop busy"), 1U);
  EXPECT_THAT(perftrailCalls(), ElementsAre("make 2", "start", "stop", "gone"));
  EXPECT_TRUE(host.log.holds("timed out waiting for performance trace to stop."));
}

TEST_F(TraceWorker, EndDelayIsWaitedBeforeTheStopAndWithinTheTime) {
  const auto nothing = [] {};
  runSession({didStart(), nothing, didComplete()}, {{"TalReportingPerfEndDelay", 2.5}});
  EXPECT_THAT(tracing.waits.waited, ElementsAre(15s, 2500ms, 177500ms));
  EXPECT_TRUE(wroteResults());
  for (const MessageValue& bad : {MessageValue(-1), MessageValue(180), MessageValue("soon")}) {
    tracing.waits.waited.clear();
    runSession({didStart(), didComplete()}, {{"TalReportingPerfEndDelay", bad}});
    EXPECT_THAT(tracing.waits.waited, ElementsAre(15s, 180s)) << bad.text();
    EXPECT_TRUE(host.log.holds("ignoring TalReportingPerfEndDelay " + bad.text()));
  }
}

TEST_F(TraceWorker, WithoutTheLibraryThereAreNoResultsAndEachClassIsLookedUpOnce) {
  tracing.skein.absent = true;
  runSession({didStart(), didComplete()});
  tracing.waits.during_waits = {didStart(), didComplete()};
  session().start();
  session().stop();
  EXPECT_THAT(tracing.skein.calls, ElementsAre("acknowledge", "look up trace", "acknowledge"));
  EXPECT_TRUE(host.log.holds("failed to create Skein model: "));
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, FailuresOnTheWayToTheResultsAreLoggedOnce) {
  struct Row {
    const char* name;
    std::function<void(test::FakeTracing&)> arrange;
    const char* line;
    bool writes;
  };
  const Row rows[] = {
      {"no property list", [](auto& t) { t.results.files["/probes.plist"] = "bad"; },
       "TalReportingSessionTraceWorker (no XML property list) failed to get SkeinProbes from /probes.plist",
       false},
      {"root is a string", [](auto& t) { t.lists.values["good"] = "text"; }, "unsupported root class string",
       false},
      {"corrupt trace", [](auto& t) { t.skein.trace_error = "truncated"; },
       "failed to create Skein model: truncated", false},
      {"no signposts", [](auto& t) { t.skein.signposts_error = "no memory"; },
       "failed to create Skein signpost model: no memory", false},
      {"directory refused", [](auto& t) { t.results.directory_error = "read-only"; },
       "can't create logging directory at /log/Audio/Traces: read-only", false},
      {"file refused", [](auto& t) { t.results.write_error = "disk full"; },
       "Failed to write file /log/Audio/Traces/temp_perfdata.pdj: disk full", true},
      {"move refused", [](auto& t) { t.results.move_error = "in use"; }, "Failed to move file", true},
      {"events lost", [](auto& t) { t.skein.discarded = 12; },
       "the trace lacks 12 events that the tracer had no room for: /", true},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    const auto list = tracing.lists.values["good"];
    tracing.results.calls.clear();
    host.log.lines.clear();
    row.arrange(tracing);
    runSession({didStart(), didComplete()});
    EXPECT_EQ(host.log.count(row.line), 1U);
    EXPECT_EQ(wroteResults(), row.writes);
    if (tracing.results.write_error) {
      EXPECT_THAT(tracing.results.calls, Not(Contains(testing::StartsWith("move"))));
    }
    tracing.results.files["/probes.plist"] = "good";
    tracing.lists.values["good"] = list;
    tracing.skein.trace_error.clear();
    tracing.skein.signposts_error.clear();
    tracing.skein.discarded = 0;
    tracing.results.directory_error = tracing.results.write_error = tracing.results.move_error = std::nullopt;
  }
}

TEST_F(TraceWorker, AFileNameThatLeadsElsewhereIsRefused) {
  for (const char* name : {"../up.pdj", "/tmp/x", "..", ""}) {
    runSession({didStart(), didComplete()}, {{"TalReportingSkeinOutputFileName", name}});
    EXPECT_EQ(host.log.count(std::string("TalReportingSkeinOutputFileName is no plain file name: ") + name),
              1U);
  }
  EXPECT_FALSE(wroteResults());
}

TEST_F(TraceWorker, EveryProbeThatMeansNothingIsOneLine) {
  using Dict = MessageDict;
  tracing.lists.values["good"] = MessageArray{
      Dict{{"name", "gap"}, {"kind", "interval"}, {"begin", "a"}, {"end", "b"}, {"processes", "mixer"}},
      Dict{{"name", "load"}, {"kind", "cpu"}},
      "text",
      Dict{{"kind", "count"}, {"events", "a"}},
      Dict{{"name", "x"}, {"kind", "interval"}, {"begin", "a"}},
      Dict{{"name", "x"}, {"kind", "count"}, {"events", MessageArray{}}},
      Dict{{"name", "x"}, {"kind", "count"}, {"events", MessageArray{1}}},
      Dict{{"name", "x"}, {"kind", "weight"}}};
  runSession({didStart(), didComplete()}, {{"TalReportingPerfProcesses", MessageArray{"mixer", "decoder"}}});
  const auto skipped = std::count_if(host.log.lines.begin(), host.log.lines.end(),
                                     [](const auto& line) { return line.text.find("skipping entry ") == 0; });
  EXPECT_EQ(skipped, 6);
  ASSERT_EQ(tracing.skein.asked.size(), 2U);
  EXPECT_EQ(tracing.skein.asked[0].begin, "a");
  EXPECT_THAT(tracing.skein.asked[0].processes, ElementsAre("mixer"));
  EXPECT_THAT(tracing.skein.asked[1].processes, ElementsAre("mixer", "decoder"));
  EXPECT_EQ(host.log.count("skipping probe load: nothing to measure"), 1U);
}

TEST_F(TraceWorker, ASessionReleasedWhileItIsTracedEndsTheTrace) {
  tracing.waits.during_waits = {didStart()};
  makeTestSession().start();
  const auto late = tracing.perftrail.delegate();
  makeSession();
  EXPECT_EQ(perftrailCalls().back(), "gone");
  EXPECT_EQ(tracing.perftrail.delegate(), nullptr);
  late->perftrailDidComplete(kTracePlace, "token", std::nullopt);  // touches nothing that has gone
}

}  // namespace
}  // namespace tal
