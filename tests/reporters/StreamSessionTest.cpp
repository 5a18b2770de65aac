#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <utility>

#include "reporters/RecordingChannel.h"
#include "reporters/pipewire/StreamSession.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::chrono_literals;

/// The calendar shows 1000 s when the steady clock shows 0.
Instant at(std::chrono::milliseconds time) {
  return {std::chrono::system_clock::time_point(1000s + time), std::chrono::steady_clock::time_point(time)};
}

class StreamSessionTest : public testing::Test {
 protected:
  StreamSessionTest() { facts.format = AudioFormat{"raw", "S16LE", 44100, 2}; }

  void open(StreamDirection direction) {
    session = std::make_unique<StreamSession>(
        direction, ReportedStream{ReportServiceType::kLongFormAudio, "player"}, at(0s), channel);
    channel.takeLines();
  }
  void playFrom(std::chrono::milliseconds time) {
    open(StreamDirection::kPlayback);
    facts.running = true;
    session->update(facts, at(time));
    channel.takeLines();
  }
  void cycle(std::chrono::milliseconds when, std::uint64_t frames, bool xrun) {
    session->addCycle({at(when).steady, frames, std::chrono::duration<double>(0.02), xrun}, at(when + 400ms));
  }

  RecordingChannel channel;
  StreamFacts facts{.running = false, .format = {}, .device = "Speakers", .gain = 0.4};
  std::unique_ptr<StreamSession> session;
};

constexpr const char* kFacts =
    " active_devices=Speakers session_selected_format=S16LE 44100 Hz mFormatID=raw"
    " mChannelsPerFrame=2";

TEST_F(StreamSessionTest, PlaybackIsTheFactsAtStartAndStopAndItsFiguresAtTheEnd) {
  session = std::make_unique<StreamSession>(StreamDirection::kPlayback,
                                            ReportedStream{ReportServiceType::kLongFormAudio, "player"},
                                            at(0s), channel);
  session->update(facts, at(100ms));
  facts.running = true;
  session->update(facts, at(500ms));
  session->update(facts, at(600ms));
  facts.running = false;
  session->update(facts, at(2500ms));
  facts.running = true;
  session->update(facts, at(3s));
  session->close(at(4s));
  const std::string volume = " RvSessionVolume=0.4";
  EXPECT_THAT(channel.lines,
              ElementsAre("open 1 7 player",
                          "1 Playback/Start session_output_running=true stretch_index=1" + volume + kFacts +
                              " talreporting_timestamp=1000.5",
                          "1 Playback/Stop session_output_running=false stretch_index=1" + volume + kFacts +
                              " talreporting_timestamp=1002.5",
                          "1 Playback/Start session_output_running=true stretch_index=2" + volume + kFacts +
                              " talreporting_timestamp=1003",
                          "1 Playback/Stop session_output_running=false stretch_index=2" + volume + kFacts +
                              " session_duration=4 xrun_episodes=0 xrun_starved_seconds=0"
                              " talreporting_timestamp=1004",
                          "close 1"));
}

TEST_F(StreamSessionTest, CaptureTellsInputAndNoVolume) {
  open(StreamDirection::kCapture);
  facts.running = true;
  session->update(facts, at(1s));
  facts.gain = 0.9;
  session->update(facts, at(2s));
  facts.device = "Headset";
  session->update(facts, at(3s));
  facts.running = false;
  session->update(facts, at(4s));
  EXPECT_THAT(channel.lines,
              ElementsAre("1 Record/Start session_input_running=true stretch_index=1" + std::string(kFacts) +
                              " talreporting_timestamp=1001",
                          "1 RouteChange/Generic active_devices=Headset talreporting_timestamp=1003",
                          "1 Record/Stop session_input_running=false stretch_index=1 active_devices=Headset"
                          " session_selected_format=S16LE 44100 Hz mFormatID=raw mChannelsPerFrame=2"
                          " talreporting_timestamp=1004"));
}

TEST_F(StreamSessionTest, ChangesOfVolumeAndDeviceAreMessagesOfTheirOwn) {
  playFrom(1s);
  facts.gain = 0.5;
  session->update(facts, at(2s));
  facts.device = "Headset";
  facts.gain = 0.25;
  session->update(facts, at(3s));
  EXPECT_THAT(channel.lines,
              ElementsAre("1 Volume/Generic RvSessionVolume=0.5 talreporting_timestamp=1002",
                          "1 RouteChange/Generic active_devices=Headset talreporting_timestamp=1003",
                          "1 Volume/Generic RvSessionVolume=0.25 talreporting_timestamp=1003"));
}

TEST_F(StreamSessionTest, BetweenTwoDevicesTheFirstStands) {
  playFrom(1s);
  facts.device.reset();
  facts.format.reset();
  facts.gain = 1.0;
  session->update(facts, at(2s));
  facts = {
      .running = true, .format = AudioFormat{"raw", "S16LE", 44100, 2}, .device = "Speakers", .gain = 0.4};
  session->update(facts, at(3s));
  EXPECT_THAT(channel.lines, IsEmpty());
}

TEST_F(StreamSessionTest, ChangesWhileItPausesAreToldBeforeTheNextStart) {
  playFrom(1s);
  facts.running = false;
  session->update(facts, at(2s));
  channel.takeLines();
  facts.running = true;
  facts.device = "Headset";
  facts.gain = 0.1;
  session->update(facts, at(3s));
  ASSERT_EQ(channel.lines.size(), 3U);
  EXPECT_THAT(channel.lines[0], testing::StartsWith("1 RouteChange/Generic active_devices=Headset"));
  EXPECT_THAT(channel.lines[1], testing::StartsWith("1 Volume/Generic RvSessionVolume=0.1"));
  EXPECT_THAT(channel.lines[2],
              testing::StartsWith("1 Playback/Start session_output_running=true stretch_index=2"
                                  " RvSessionVolume=0.1 active_devices=Headset"));
}

TEST_F(StreamSessionTest, NothingIsToldOfAStreamThatHasNotBegun) {
  open(StreamDirection::kPlayback);
  facts.gain = 0.7;
  session->update(facts, at(1s));
  facts.device = "Headset";
  session->update(facts, at(2s));
  EXPECT_THAT(channel.lines, IsEmpty());
  session->close(at(3s));
  EXPECT_THAT(channel.lines, ElementsAre("1 Playback/Stop session_output_running=false stretch_index=0"
                                         " session_duration=3 xrun_episodes=0 xrun_starved_seconds=0"
                                         " talreporting_timestamp=1003",
                                         "close 1"));
}

TEST_F(StreamSessionTest, AnotherFormatBeginsAnotherStretch) {
  playFrom(1s);
  facts.format = AudioFormat{"raw", "F32LE", 96000, 6};
  session->update(facts, at(2s));
  ASSERT_EQ(channel.lines.size(), 2U);
  EXPECT_THAT(channel.lines[0],
              testing::HasSubstr("Playback/Stop session_output_running=false stretch_index=1"));
  EXPECT_THAT(channel.lines[0], testing::HasSubstr("S16LE 44100 Hz"));
  EXPECT_THAT(channel.lines[1],
              testing::HasSubstr("Playback/Start session_output_running=true stretch_index=2"));
  EXPECT_THAT(channel.lines[1], testing::HasSubstr("F32LE 96000 Hz mFormatID=raw mChannelsPerFrame=6"));
}

TEST_F(StreamSessionTest, AfterTheLossOfTheDaemonTheStartIsRepeatedFromTheLastChange) {
  playFrom(1s);
  session->repeatStart();
  facts.gain = 0.5;
  session->update(facts, at(5s));
  session->repeatStart();
  ASSERT_EQ(channel.lines.size(), 3U);
  EXPECT_EQ(channel.lines[0],
            "1 Playback/Start session_output_running=true stretch_index=1 RvSessionVolume=0.4" +
                std::string(kFacts) + " talreporting_timestamp=1001");
  EXPECT_EQ(channel.lines[2],
            "1 Playback/Start session_output_running=true stretch_index=1 RvSessionVolume=0.5" +
                std::string(kFacts) + " talreporting_timestamp=1005");
  channel.takeLines();
  facts.running = false;
  session->update(facts, at(6s));
  channel.takeLines();
  session->repeatStart();
  EXPECT_THAT(channel.lines, IsEmpty()) << "a paused stream has nothing to repeat";
}

TEST_F(StreamSessionTest, TheFirstXrunOfAnEpisodeIsToldAndAllAreSummedUp) {
  playFrom(1s);
  cycle(1100ms, 1024, false);
  cycle(1200ms, 512, false);
  cycle(1300ms, 2048, true);
  cycle(1300ms, 2048, true);  // the same turn, reported again
  cycle(1400ms, 1024, true);
  cycle(2500ms, 1024, false);
  cycle(2600ms, 256, true);
  session->close(at(3s));
  ASSERT_EQ(channel.lines.size(), 4U);
  EXPECT_EQ(channel.lines[0],
            "1 IO/Error issue_type=overload smallest_buffer_frame_size=512 io_cycle=3"
            " talreporting_timestamp=1001.3");
  EXPECT_EQ(channel.lines[1],
            "1 IO/Error issue_type=overload smallest_buffer_frame_size=256 io_cycle=6"
            " talreporting_timestamp=1002.6");
  EXPECT_THAT(channel.lines[2], testing::HasSubstr("xrun_episodes=2 xrun_starved_seconds=0.06 "));
}

TEST_F(StreamSessionTest, EachStretchCountsItsOwnTurnsAndBuffers) {
  playFrom(1s);
  cycle(1100ms, 256, false);
  facts.running = false;
  session->update(facts, at(2s));
  facts.running = true;
  session->update(facts, at(3s));
  channel.takeLines();
  cycle(3100ms, 1024, true);
  EXPECT_THAT(channel.lines,
              ElementsAre("1 IO/Error issue_type=overload smallest_buffer_frame_size=1024 io_cycle=1"
                          " talreporting_timestamp=1003.1"));
}

TEST_F(StreamSessionTest, XrunsOfAPausedStreamDoNotCount) {
  playFrom(1s);
  facts.running = false;
  session->update(facts, at(2s));
  channel.takeLines();
  cycle(2100ms, 1024, true);
  EXPECT_THAT(channel.lines, IsEmpty());
}

/// The daemon drops a message that equals the last one of its category and type in everything but the time
/// stamp. Whatever happens to a stream, no message that matters may be such a one.
TEST_F(StreamSessionTest, NoMessageIsEverRedundant) {
  open(StreamDirection::kPlayback);
  std::mt19937 random(20240229);
  const auto pick = [&](int count) { return std::uniform_int_distribution(0, count - 1)(random); };
  for (int step = 0; step < 5000; ++step) {
    switch (pick(5)) {
      case 0:
        facts.running = !facts.running;
        break;
      case 1:
        facts.gain = 0.1 * pick(3);
        break;
      case 2:
        facts.device = pick(2) == 0 ? "Speakers" : "Headset";
        break;
      case 3:
        facts.device.reset();
        break;
      default:
        facts.format = AudioFormat{"raw", "S16LE", pick(2) == 0 ? 44100U : 48000U, 2};
        break;
    }
    session->update(facts, at(std::chrono::milliseconds(step)));
  }
  session->close(at(6s));

  std::map<std::pair<ReportCategory, ReportType>, ReportFields> last;
  for (auto [reporter, message] : channel.sent) {
    ASSERT_EQ(message.fields.back().first, "talreporting_timestamp");
    message.fields.pop_back();
    auto& before = last[{message.category, message.type}];
    ASSERT_NE(before, message.fields);
    before = message.fields;
  }
  EXPECT_GT(channel.sent.size(), 1000U);
}

}  // namespace
}  // namespace tal
