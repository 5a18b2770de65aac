#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/HostFakes.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/driver_stats/LinuxDriverStatsFeed.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

std::string nameOf(const DriverStatsDescription& description) {
  std::string name;
  for (const auto& part : {description.driver_name, description.group, description.subgroup,
                           description.channel_name, description.unit_label}) {
    name += (name.empty() ? "" : "|") + part.value_or("-");
  }
  return name;
}

std::string textOf(const DriverStatsChannel& channel) {
  std::string text = *channel.description.channel_name;
  if (channel.description.format == DriverStatsFormat::kSimple) {
    text += ' ' + std::to_string(channel.integer_value);
  }
  for (const auto& state : channel.states) text += ' ' + state.name + '=' + std::to_string(state.residency);
  for (const auto& bucket : channel.buckets) text += ' ' + std::to_string(bucket.hits);
  return text;
}

/// A laptop with a built-in card and a headset, copied so that time can pass on it.
class DriverStatsOfMachine : public testing::Test {
 protected:
  DriverStatsOfMachine() {
    fs::copy(TAL_SOUND_MACHINE, root(), fs::copy_options::recursive | fs::copy_options::copy_symlinks);
    fs::create_directories(directory.path() / "config");
  }
  fs::path root() const { return directory.path() / "root"; }
  void write(const std::string& path, const std::string& text) { test::writeFile(root() / path, text); }
  void edit(const std::string& path, const std::string& old_text, const std::string& new_text) {
    std::string text = test::readFile(root() / path);
    const auto at = text.find(old_text);
    ASSERT_NE(at, std::string::npos) << path << " has no " << old_text;
    write(path, text.replace(at, old_text.size(), new_text));
  }
  void dropIn(const std::string& name, const std::string& text) {
    test::writeFile(directory.path() / "config/drvstats.d" / name, text);
  }

  std::vector<DriverStatsDescription> channelsOf(std::optional<std::string> group,
                                                 std::optional<std::string> subgroup = std::nullopt) {
    return feed.copyChannels(group, subgroup).value.value().channels;
  }
  std::unique_ptr<DriverStatsSubscription> subscribe(std::optional<std::string> group,
                                                     std::optional<std::string> subgroup = std::nullopt) {
    auto channels = feed.copyChannels(group, subgroup);
    return feed.createSubscription(channels.value.value()).subscription;
  }
  DriverStatsFeed::SampleSetPointer sample(const DriverStatsSubscription& subscription) {
    return std::move(feed.createSamples(subscription).value.value());
  }
  /// What happened since the samples: the channels with a value that is not 0.
  std::vector<std::string> since(const DriverStatsSampleSet& before,
                                 const DriverStatsSubscription& subscription) {
    std::vector<std::string> texts;
    const auto latest = sample(subscription);
    const auto delta = feed.createSamplesDelta(&before, *latest).value.value();
    for (const auto& channel : delta) {
      if (channel.description.format != DriverStatsFormat::kSimple || channel.integer_value != 0) {
        texts.push_back(textOf(channel));
      }
    }
    return texts;
  }

  test::TemporaryDirectory directory;
  test::RecordingLogSink lines;
  LogChannel log{"talrd", &lines, LogLevel::kDefault};
  LinuxDriverStatsFeed feed{{.config_directory = directory.path() / "config", .log = log, .root = root()}};
};

TEST_F(DriverStatsOfMachine, ChannelsAreThoseThatTheKernelHasASourceFor) {
  std::vector<std::string> names;
  for (const auto& description : channelsOf({})) {
    names.push_back(nameOf(description));
  }
  EXPECT_THAT(names, ElementsAre("HDA-Intel|Rx|-|PCH pcm0c sub0 Frames|frames",
                                 "HDA-Intel|Rx|-|PCH pcm0c sub0 Largest Fill|frames",
                                 "USB-Audio|Rx|-|Headset pcm0c sub0 Frames|frames",
                                 "USB-Audio|Rx|-|Headset pcm0c sub0 Largest Fill|frames",
                                 "HDA-Intel|Tx|-|PCH pcm0p sub0 Frames|frames",
                                 "HDA-Intel|Tx|-|PCH pcm0p sub0 Largest Room|frames",
                                 "HDA-Intel|Tx|-|PCH pcm3p sub0 Frames|frames",
                                 "HDA-Intel|Tx|-|PCH pcm3p sub0 Largest Room|frames",
                                 "USB-Audio|Tx|-|Headset pcm0p sub0 Frames|frames",
                                 "USB-Audio|Tx|-|Headset pcm0p sub0 Largest Room|frames",
                                 "HDA-Intel|-|MCA|PCH Interrupts|interrupts",
                                 "HDA-Intel|StateTransitionTimes_ms|-|PCH 0000:00:1f.3|ms",
                                 "HDA-Intel|StateTransitionTimes_ms|-|PCH hdaudioC0D0|ms",
                                 "USB-Audio|StateTransitionTimes_ms|-|Headset 1-2:1.0|ms"));
  for (const char* group : {"VantleAE2MCA", "Speaker", "pdm", "PCH"}) {
    EXPECT_THAT(channelsOf(group), IsEmpty()) << group;
  }
  EXPECT_THAT(channelsOf({}, "MCA"), SizeIs(1));
  write("sys/class/sound/card1/device/power/runtime_status", "unsupported\n");
  EXPECT_THAT(channelsOf("StateTransitionTimes_ms"), SizeIs(2)) << "of a driver that manages no power";
  fs::remove_all(root());
  EXPECT_THAT(channelsOf({}), IsEmpty()) << "a machine without sound";
  EXPECT_THAT(lines.lines(), IsEmpty());
}

TEST_F(DriverStatsOfMachine, DifferenceIsWhatHappenedBetweenTwoReadings) {
  const auto all = subscribe({});
  const auto before = sample(*all);
  edit("proc/asound/card0/pcm0p/sub0/status", "hw_ptr      : 480038", "hw_ptr      : 528038");
  edit("proc/asound/card0/pcm0p/sub0/status", "avail_max   : 15808", "avail_max   : 16000");
  write("proc/asound/card0/pcm0c/sub0/status",
        test::readFile(root() / "proc/asound/card1/pcm0c/sub0/status"));
  write("proc/asound/card1/pcm0c/sub0/status", "closed\n");
  edit("proc/interrupts", "7023          0          0        411", "7123          0          1        411");
  edit("proc/interrupts", "88211", "99999");
  write("sys/devices/pci0000:00/0000:00:1f.3/power/runtime_active_time", "5012208\n");
  write("sys/devices/pci0000:00/0000:00:1f.3/hdaudioC0D0/power/runtime_suspended_time", "2721041\n");
  EXPECT_THAT(since(*before, *all),
              ElementsAre("PCH pcm0c sub0 Frames 1507584", "PCH pcm0c sub0 Largest Fill 1923",
                          "PCH pcm0p sub0 Frames 48000", "PCH pcm0p sub0 Largest Room 16000",
                          "PCH Interrupts 101", "PCH 0000:00:1f.3 active=1000 suspended=0",
                          "PCH hdaudioC0D0 active=0 suspended=500", "Headset 1-2:1.0 active=0 suspended=0"));
}

TEST_F(DriverStatsOfMachine, CardsMayComeAndGo) {
  const auto playback = subscribe("Tx");
  const auto capture = subscribe("Rx");
  const auto power = subscribe("StateTransitionTimes_ms");
  const auto playback_before = sample(*playback);
  const auto capture_before = sample(*capture);
  const auto power_before = sample(*power);
  // The built-in card goes; another comes under its number and plays at once.
  fs::rename(root() / "proc/asound/card0/pcm0p", root() / "kept");
  fs::remove_all(root() / "proc/asound/card0");
  fs::create_directories(root() / "proc/asound/card0");
  fs::rename(root() / "kept", root() / "proc/asound/card0/pcm0p");
  edit("proc/asound/cards", "[PCH            ]: HDA-Intel", "[Dock           ]: USB-Audio");
  EXPECT_THAT(since(*playback_before, *playback),
              ElementsAre("Dock pcm0p sub0 Frames 480038", "Dock pcm0p sub0 Largest Room 15808"));
  EXPECT_THAT(since(*capture_before, *capture), ElementsAre("Headset pcm0c sub0 Largest Fill 1923"))
      << "the headset stayed where it was";
  EXPECT_THAT(since(*power_before, *power), ElementsAre("Headset 1-2:1.0 active=0 suspended=0"))
      << "of a device that was not there, nothing can be told";
}

TEST_F(DriverStatsOfMachine, OverlappingReadingsDoNotTakeEachOthersPeaks) {
  const std::string status = "proc/asound/card1/pcm0c/sub0/status";
  const auto capture = subscribe("Rx");
  const auto first = sample(*capture);
  edit(status, "avail_max   : 1923", "avail_max   : 700");
  const auto second = sample(*capture);
  edit(status, "avail_max   : 700", "avail_max   : 300");
  EXPECT_THAT(since(*second, *capture), ElementsAre("Headset pcm0c sub0 Largest Fill 300"));
  EXPECT_THAT(since(*first, *capture), ElementsAre("Headset pcm0c sub0 Largest Fill 700"));
}

TEST_F(DriverStatsOfMachine, InterruptsAreTheCardsByNameOrByItsDeviceUnlessTheLineIsShared) {
  edit("proc/interrupts", "snd_hda_intel:card0", "AudioDSP");
  EXPECT_THAT(channelsOf({}, "MCA"), SizeIs(1));
  fs::remove_all(root() / "sys/devices/pci0000:00/0000:00:1f.3/msi_irqs");
  EXPECT_THAT(channelsOf({}, "MCA"), SizeIs(1));
  edit("proc/interrupts", "AudioDSP", "i2c_designware, snd_hda_intel:card0");
  EXPECT_THAT(channelsOf({}, "MCA"), IsEmpty());
  edit("proc/interrupts", "i801_smbus", "snd_ens1371:card1");
  EXPECT_EQ(nameOf(channelsOf({}, "MCA").at(0)), "USB-Audio|-|MCA|Headset Interrupts|interrupts");
}

TEST_F(DriverStatsOfMachine, DropInFilesBringWhateverADriverExports) {
  dropIn("amp.json", R"({"group": "Speaker", "subgroup": "Amp", "driver": "acme_amp<0>", "channels": [
      {"name": "Clips", "file": "/sys/acme/clips", "format": "simple", "unit": "events", "bits": 16},
      {"name": "Power", "file": "/sys/acme/power", "format": "state"},
      {"name": "Late", "file": "/sys/acme/late", "format": "histogram", "unit": "us"}]})");
  write("sys/acme/clips", "65530\n");
  write("sys/acme/power", "on 4 1000\noff 3 50\n");
  write("sys/acme/late", "0 99 5\n100 999 0\n");
  const auto speaker = subscribe("Speaker");
  const auto before = sample(*speaker);
  write("sys/acme/clips", "4\n");
  write("sys/acme/power", "on 5 1200\noff 4 80\n");
  write("sys/acme/late", "0 99 5\n100 999 2\n");
  EXPECT_THAT(since(*before, *speaker), ElementsAre("Clips 10", "Power on=200 off=30", "Late 0 2"));
  EXPECT_EQ(nameOf(channelsOf("Speaker", "Amp").at(0)), "acme_amp<0>|Speaker|Amp|Clips|events");
  EXPECT_THAT(lines.lines(), IsEmpty());
}

TEST_F(DriverStatsOfMachine, ABadDropInFileIsOneLineAndLeavesTheOthersAlone) {
  const std::string channel = R"({"name": "n", "file": "/n", "format": "simple"})";
  const auto with = [&](const std::string& old_text, const std::string& new_text) {
    std::string text = R"({"group": "pdm", "channels": [)" + channel + "]}";
    return text.replace(text.find(old_text), old_text.size(), new_text);
  };
  using Row = std::pair<std::string, std::string>;
  const std::vector<Row> rows{
      {"{", "parse error at line 1"},
      {"[]", "the file is not an object"},
      {with("\"pdm\"", "4"), "the file: \"group\" is not a text"},
      {with("\"group\"", "\"grupo\""), "the file has an unknown key \"grupo\""},
      {with("\"group\": \"pdm\",", ""), "neither \"group\" nor \"subgroup\""},
      {with("[" + channel + "]", "[]"), "\"channels\" is not a list of 1 to 256"},
      {with(channel, "7"), "channel 1 is not an object"},
      {with(channel, channel + ',' + "{}"), "channel 2 has no \"name\""},
      {with("\"name\"", "\"nam\""), "channel 1 has an unknown key \"nam\""},
      {with("\"/n\"", "\"n\""), "channel 1: \"file\" is not an absolute path"},
      {with("\"simple\"", "\"text\""), "none of simple, state, histogram"},
      {with("\"/n\"", "\"/n\", \"bits\": 65"), "\"bits\" is not a number from 1 to 64"},
      {with("\"n\"", "\"\xff\""), "ill-formed UTF-8"}};
  for (std::size_t i = 0; i < rows.size(); ++i) dropIn(std::to_string(100 + i) + ".json", rows[i].first);
  dropIn("good.json", with("n", "n"));
  dropIn("notes.txt", "{");
  fs::create_directory(directory.path() / "config/drvstats.d/zdir.json");
  write("n", "5\n");
  EXPECT_THAT(channelsOf("pdm"), SizeIs(1));
  feed.copyChannels("Speaker", {});
  const auto logged = lines.lines();
  ASSERT_THAT(logged, SizeIs(rows.size() + 1));
  for (std::size_t i = 0; i < rows.size(); ++i) {
    EXPECT_THAT(logged[i], HasSubstr(std::to_string(100 + i) + ".json is ignored: "));
    EXPECT_THAT(logged[i], HasSubstr(rows[i].second));
  }
  EXPECT_THAT(logged.back(), HasSubstr("zdir.json is ignored: cannot be read"));
}

TEST_F(DriverStatsOfMachine, AChannelWhoseFileIsBadIsLeftOutAndSaidOnceUntilItIsGood) {
  dropIn("a.json", R"({"group": "pdm", "channels": [
      {"name": "missing", "file": "/missing", "format": "simple"},
      {"name": "good", "file": "/good", "format": "simple"},
      {"name": "mistaken", "file": "/good", "format": "histogram"}]})");
  write("good", "5\n");
  const auto pdm = subscribe("pdm");
  const auto before = sample(*pdm);
  ASSERT_THAT(lines.lines(), SizeIs(2));
  EXPECT_THAT(lines.lines()[0], HasSubstr("channel missing is left out: /missing: No such file"));
  write("good", "6\n");
  write("missing", "5\n");
  EXPECT_THAT(since(*before, *pdm), ElementsAre("good 1")) << "the other has nothing to be compared with";
  write("missing", "five\n");
  EXPECT_THAT(since(*before, *pdm), ElementsAre("good 1"));
  ASSERT_THAT(lines.lines(), SizeIs(3)) << "that the same file is good for another channel changes nothing";
  EXPECT_THAT(lines.lines()[1], HasSubstr("channel mistaken is left out: /good: is not of its format"));
  EXPECT_THAT(lines.lines()[2], HasSubstr("/missing: is not of its format"));
}

TEST_F(DriverStatsOfMachine, ASourceThatIsThereAndCannotBeReadFailsTheDriver) {
  const auto playback = subscribe("Tx");
  EXPECT_EQ(feed.createSamplesDelta(nullptr, *sample(*playback)).error, EINVAL);
  fs::remove(root() / "proc/asound/cards");
  fs::create_directory(root() / "proc/asound/cards");
  EXPECT_EQ(feed.createSamples(*playback).error, EINVAL);
  EXPECT_EQ(feed.copyChannels("Tx", {}).error, EINVAL);
}

}  // namespace
}  // namespace tal
