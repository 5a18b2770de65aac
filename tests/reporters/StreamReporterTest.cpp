#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "reporters/RecordingChannel.h"
#include "reporters/pipewire/StreamReporter.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;
using namespace std::chrono_literals;

constexpr ObjectID kSink = 30;
constexpr ObjectID kFirst = 50;
constexpr ObjectID kSecond = 51;

Instant at(std::chrono::milliseconds time) {
  return {std::chrono::system_clock::time_point(1000s + time), std::chrono::steady_clock::time_point(time)};
}

class StreamReporterTest : public testing::Test {
 protected:
  StreamReporterTest() { reporter.graph().addNode(kSink, NodeKind::kDevice, "Speakers"); }

  void addStream(ObjectID id, const std::string& name) {
    reporter.graph().addNode(id, NodeKind::kPlaybackStream, name);
    reporter.graph().describeNode(
        id, {.mediaRole = "Music", .title = name, .application = {"", "", name}, .client = {}});
    reporter.graph().addLink(id + 100, id, kSink);
  }
  void run(ObjectID id, bool running, std::chrono::milliseconds time) {
    reporter.graph().setNodeRunning(id, running);
    reporter.settle(at(time));
  }
  GraphCycle cycle(std::chrono::milliseconds when, std::uint32_t driverXruns, bool firstLate,
                   bool secondLate) {
    return {.driver = kSink,
            .when = at(when).steady,
            .frames = 480,
            .rate = 48000,
            .driverXruns = driverXruns,
            .followers = {{kFirst, firstLate}, {kSecond, secondLate}, {99, true}}};
  }

  RecordingChannel channel;
  StreamReporter reporter{channel};
};

TEST_F(StreamReporterTest, EachStreamHasASessionOfItsOwnUntilItGoes) {
  addStream(kFirst, "one");
  run(kFirst, true, 1s);
  addStream(kSecond, "two");
  run(kSecond, true, 2s);
  reporter.settle(at(3s));
  reporter.removeObject(kFirst, at(4s));
  EXPECT_THAT(channel.lines,
              ElementsAre("open 1 7 one", StartsWith("1 Playback/Start"), "open 2 7 two",
                          StartsWith("2 Playback/Start"), HasSubstr("session_duration=3 "), "close 1"));
  EXPECT_TRUE(reporter.anythingRuns());
  run(kSecond, false, 5s);
  EXPECT_FALSE(reporter.anythingRuns());
}

TEST_F(StreamReporterTest, AStreamThatGoesWithoutStoppingIsClosedByOneStop) {
  addStream(kFirst, "one");
  run(kFirst, true, 1s);
  channel.takeLines();
  reporter.graph().setNodeRunning(kFirst, false);  // told, but not settled when the node is removed
  reporter.removeObject(kFirst, at(3s));
  EXPECT_THAT(channel.lines,
              ElementsAre(StartsWith("1 Playback/Stop session_output_running=false"), "close 1"));
  EXPECT_THAT(channel.lines[0], HasSubstr("session_duration=2 "));
}

TEST_F(StreamReporterTest, AStreamThatComesAndGoesWithinOneBurstIsReported) {
  addStream(kFirst, "blip");
  reporter.graph().setNodeRunning(kFirst, true);
  reporter.removeObject(kFirst, at(1s));
  EXPECT_THAT(channel.lines, ElementsAre("open 1 7 blip", StartsWith("1 Playback/Start"),
                                         StartsWith("1 Playback/Stop"), "close 1"));
}

TEST_F(StreamReporterTest, TheSameIdentifierLaterIsAnotherSession) {
  addStream(kFirst, "one");
  run(kFirst, true, 1s);
  reporter.removeObject(kFirst, at(2s));
  channel.takeLines();
  addStream(kFirst, "two");
  run(kFirst, true, 3s);
  EXPECT_THAT(channel.lines, ElementsAre("open 2 7 two", HasSubstr("stretch_index=1 ")));
}

TEST_F(StreamReporterTest, TheLossOfPipeWireClosesAllStreamsAndForgetsTheGraph) {
  addStream(kFirst, "one");
  addStream(kSecond, "two");
  run(kFirst, true, 1s);
  channel.takeLines();
  reporter.closeAll(at(2s));
  EXPECT_THAT(channel.lines, ElementsAre(HasSubstr("session_duration=1 "), "close 1",
                                         HasSubstr("session_duration=1 "), "close 2"));
  channel.takeLines();
  reporter.settle(at(3s));
  EXPECT_THAT(channel.lines, IsEmpty());
  EXPECT_FALSE(reporter.anythingRuns());
}

TEST_F(StreamReporterTest, TheLossOfTheDaemonRepeatsTheStartsOfWhatRuns) {
  addStream(kFirst, "one");
  addStream(kSecond, "two");
  run(kFirst, true, 1s);
  channel.takeLines();
  reporter.repeatStarts();
  EXPECT_THAT(channel.lines,
              ElementsAre(StartsWith("1 Playback/Start session_output_running=true stretch_index=1")));
}

TEST_F(StreamReporterTest, ALateStreamHasTheXrunAndALateDriverAllItsStreams) {
  addStream(kFirst, "one");
  addStream(kSecond, "two");
  run(kFirst, true, 1s);
  run(kSecond, true, 1s);
  channel.takeLines();
  reporter.addCycle(cycle(1010ms, 7, false, false), at(2s));
  EXPECT_THAT(channel.lines, IsEmpty()) << "the driver's xruns of earlier times are no news";
  reporter.addCycle(cycle(1020ms, 7, false, true), at(2s));
  EXPECT_THAT(channel.takeLines(), ElementsAre(StartsWith("2 IO/Error issue_type=overload")));
  reporter.addCycle(cycle(5000ms, 8, false, false), at(6s));
  EXPECT_THAT(channel.takeLines(), ElementsAre(StartsWith("1 IO/Error"), StartsWith("2 IO/Error")));
  reporter.removeObject(kSecond, at(7s));
  EXPECT_THAT(channel.lines[0], HasSubstr("xrun_episodes=2 xrun_starved_seconds=0.02 "));
}

TEST_F(StreamReporterTest, XrunsThatNobodyListenedToAreNoNews) {
  addStream(kFirst, "one");
  run(kFirst, true, 1s);
  reporter.addCycle(cycle(1010ms, 7, false, false), at(2s));
  run(kFirst, false, 3s);
  run(kFirst, true, 4s);
  channel.takeLines();
  reporter.addCycle(cycle(4010ms, 9, false, false), at(5s));
  EXPECT_THAT(channel.lines, IsEmpty());
}

TEST_F(StreamReporterTest, AnotherDriverUnderTheSameIdentifierCountsAnew) {
  addStream(kFirst, "one");
  run(kFirst, true, 1s);
  reporter.addCycle(cycle(1010ms, 7, false, false), at(2s));
  reporter.removeObject(kSink, at(3s));
  channel.takeLines();
  reporter.addCycle(cycle(3010ms, 2, false, false), at(4s));
  EXPECT_THAT(channel.lines, IsEmpty());
  reporter.addCycle(cycle(3020ms, 3, false, false), at(4s));
  EXPECT_THAT(channel.lines, ElementsAre(StartsWith("1 IO/Error")));
}

}  // namespace
}  // namespace tal
