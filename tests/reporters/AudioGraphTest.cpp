#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

#include "reporters/pipewire/AudioGraph.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr ObjectID kStream = 50;
constexpr ObjectID kSink = 30;
constexpr ObjectID kOtherSink = 31;
constexpr ObjectID kClient = 40;

class AudioGraphTest : public testing::Test {
 protected:
  AudioGraphTest() {
    graph.addNode(kSink, NodeKind::kDevice, "Speakers");
    graph.addNode(kOtherSink, NodeKind::kDevice, "Headset");
    graph.addNode(kStream, NodeKind::kPlaybackStream, "pw-play");
  }

  AudioGraph graph;
};

TEST(NodeKindOf, FollowsTheMediaClass) {
  EXPECT_EQ(nodeKindOf("Stream/Output/Audio"), NodeKind::kPlaybackStream);
  EXPECT_EQ(nodeKindOf("Stream/Input/Audio"), NodeKind::kCaptureStream);
  for (const char* device : {"Audio/Sink", "Audio/Source", "Audio/Duplex", "Audio/Source/Virtual"}) {
    EXPECT_EQ(nodeKindOf(device), NodeKind::kDevice) << device;
  }
  for (const char* other :
       {"Stream/Output/Video", "Stream/Output/Audio/Internal", "Video/Source", "Midi/Bridge", ""}) {
    EXPECT_EQ(nodeKindOf(other), NodeKind::kOther) << other;
  }
}

TEST_F(AudioGraphTest, AStreamIsReportedOnceItHasDescribedItself) {
  EXPECT_THAT(graph.describedStreams(), IsEmpty());
  graph.describeNode(kSink, {});
  EXPECT_THAT(graph.describedStreams(), IsEmpty());
  graph.describeNode(kStream, {});
  EXPECT_THAT(graph.describedStreams(), ElementsAre(kStream));
  graph.removeObject(kStream);
  EXPECT_THAT(graph.describedStreams(), IsEmpty());
}

TEST_F(AudioGraphTest, AnIdentifierThatIsTakenAgainIsAnotherNode) {
  graph.describeNode(kStream, {.mediaRole = "Music", .title = {}, .application = {}, .client = {}});
  graph.setNodeRunning(kStream, true);
  graph.addNode(kStream, NodeKind::kCaptureStream, "pw-record");
  EXPECT_THAT(graph.describedStreams(), IsEmpty());
  graph.describeNode(kStream, {});
  EXPECT_EQ(graph.directionOf(kStream), StreamDirection::kCapture);
  EXPECT_FALSE(graph.factsOf(kStream).running);
}

TEST_F(AudioGraphTest, TheClientNamesTheApplicationWhereTheStreamDoesNot) {
  graph.describeNode(kStream, {.mediaRole = "Phone", .title = {}, .application = {}, .client = kClient});
  EXPECT_EQ(graph.identityOf(kStream), (ReportedStream{ReportServiceType::kTelephony, ""}));
  graph.setClient(kClient, {"", "caller", "Caller"});
  EXPECT_EQ(graph.identityOf(kStream), (ReportedStream{ReportServiceType::kTelephony, "caller"}));
}

TEST_F(AudioGraphTest, TheGainRunsFromTheStreamToItsDevice) {
  graph.describeNode(kStream, {});
  graph.setNodeVolume(kStream, {0.5, {1.0, 0.5}, false});
  EXPECT_EQ(graph.factsOf(kStream).device, std::nullopt);
  EXPECT_EQ(graph.factsOf(kStream).gain, 0.375);
  graph.addLink(60, kStream, kSink);
  graph.setNodeVolume(kSink, {1.0, {0.4F, 0.4F}, false});
  EXPECT_EQ(graph.factsOf(kStream).device, "Speakers");
  EXPECT_EQ(graph.factsOf(kStream).gain, 0.15) << "free of the noise of 32-bit factors";
  graph.setNodeVolume(kSink, {1.0, {0.4F, 0.4F}, true});
  EXPECT_EQ(graph.factsOf(kStream).gain, 0.0);
  graph.setNodeVolume(kSink, {std::numeric_limits<double>::quiet_NaN(), {}, false});
  EXPECT_EQ(graph.factsOf(kStream).gain, 0.0) << "not a number would differ from itself forever";
}

TEST_F(AudioGraphTest, OfSeveralDevicesTheOldestLinkCounts) {
  graph.describeNode(kStream, {});
  graph.addLink(61, kStream, kSink);
  graph.addLink(62, kStream, kOtherSink);
  EXPECT_EQ(graph.factsOf(kStream).device, "Speakers");
  graph.removeObject(61);
  EXPECT_EQ(graph.factsOf(kStream).device, "Headset");
  graph.removeObject(kOtherSink);
  EXPECT_EQ(graph.factsOf(kStream).device, std::nullopt);
}

TEST_F(AudioGraphTest, ARecorderOfASinkRecordsFromThatSink) {
  constexpr ObjectID kRecorder = 51;
  graph.addNode(kRecorder, NodeKind::kCaptureStream, "pw-record");
  graph.describeNode(kRecorder, {});
  graph.addLink(60, kStream, kSink);
  graph.addLink(61, kSink, kRecorder);
  EXPECT_EQ(graph.factsOf(kRecorder).device, "Speakers");
}

TEST_F(AudioGraphTest, ADeviceGoesBeforeAStreamThatTapsIn) {
  constexpr ObjectID kTap = 51;
  graph.addNode(kTap, NodeKind::kCaptureStream, "Meter");
  graph.describeNode(kStream, {});
  graph.addLink(60, kStream, kTap);
  EXPECT_EQ(graph.factsOf(kStream).device, "Meter");
  graph.addLink(61, kStream, kSink);
  EXPECT_EQ(graph.factsOf(kStream).device, "Speakers");
}

}  // namespace
}  // namespace tal
