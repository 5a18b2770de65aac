#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <tuple>
#include <vector>

#include "reporters/pipewire/StreamRules.h"
#include "reporters/pipewire/XrunEpisodes.h"

namespace tal {
namespace {

TEST(StreamRules, ServiceTypeFollowsTheMediaRole) {
  const std::vector<std::pair<std::string, int>> rows{
      {"Music", 7},      {"Movie", 7},         {"Communication", 2}, {"Phone", 2},
      {"Alarm", 4},      {"Notification", 13}, {"Event", 13},        {"Game", 8},
      {"Production", 8}, {"Accessibility", 8}, {"DSP", 8},           {"music", 8},
      {"", 8},
  };
  for (const auto& [role, type] : rows) {
    EXPECT_EQ(static_cast<int>(serviceTypeForRole(role)), type) << "role '" << role << "'";
  }
}

TEST(StreamRules, ApplicationNameIsTheIdElseTheBinaryElseTheName) {
  const std::vector<std::tuple<ApplicationNames, ApplicationNames, std::string>> rows{
      {{"org.example.Player", "player", "Player"}, {}, "org.example.Player"},
      {{"", "player", "Player"}, {}, "player"},
      {{"", "", "Player"}, {}, "Player"},
      {{}, {"org.example.Player", "player", "Player"}, "org.example.Player"},
      {{"org.example.Tab", "", ""}, {"org.example.Browser", "", ""}, "org.example.Tab"},
      {{"", "", "pw-play"}, {"", "pw-cat", "pw-cat"}, "pw-cat"},
      {{"", "plugin", ""}, {"org.example.Host", "", ""}, "org.example.Host"},
      {{}, {}, ""},
  };
  for (const auto& [stream, client, name] : rows) EXPECT_EQ(applicationNameOf(stream, client), name);
}

TEST(StreamRules, GainIsVolumeTimesTheMeanOfTheChannels) {
  const std::vector<std::pair<NodeVolume, double>> rows{
      {{1.0, {}, false}, 1.0},         {{0.5, {}, false}, 0.5},         {{0.5, {0.5, 1.0}, false}, 0.375},
      {{1.0, {0.25}, false}, 0.25},    {{1.0, {0.0, 0.0}, false}, 0.0}, {{0.5, {0.5, 1.0}, true}, 0.0},
      {{1.5, {1.0, 1.0}, false}, 1.5},
  };
  for (const auto& [volume, gain] : rows) EXPECT_DOUBLE_EQ(gainOf(volume), gain);
}

TEST(StreamRules, FormatTextNamesSampleFormatAndRate) {
  EXPECT_EQ(formatText({"raw", "S16LE", 44100, 2}), "S16LE 44100 Hz");
  EXPECT_EQ(formatText({"raw", "F32P", 0, 1}), "F32P");
  EXPECT_EQ(formatText({"iec958", "", 48000, 2}), "iec958 48000 Hz");
}

TEST(StreamRules, TextIsMadeWellFormed) {
  const std::string bad = "\xEF\xBF\xBD";
  const std::vector<std::pair<std::string, std::string>> rows{
      {"", ""},
      {"Headphones", "Headphones"},
      {"Kopfh\xC3\xB6rer \xE2\x99\xAB \xF0\x9F\x8E\xA7", "Kopfh\xC3\xB6rer \xE2\x99\xAB \xF0\x9F\x8E\xA7"},
      {"Kopfh\xF6rer", "Kopfh" + bad + "rer"},
      {"cut \xE2\x99", "cut " + bad + bad},
      {"\x80", bad},
      {"overlong \xC0\xAF", "overlong " + bad + bad},
      {"overlong \xE0\x80\xAF", "overlong " + bad + bad + bad},
      {"surrogate \xED\xA0\x80", "surrogate " + bad + bad + bad},
      {"beyond \xF4\x90\x80\x80", "beyond " + bad + bad + bad + bad},
      {"last \xF4\x8F\xBF\xBF", "last \xF4\x8F\xBF\xBF"},
  };
  for (const auto& [text, clean] : rows) EXPECT_EQ(validUtf8(text), clean);
}

TEST(XrunEpisodes, OnlyAPauseOfASecondBeginsAnEpisode) {
  using namespace std::chrono_literals;
  const XrunEpisodes::TimePoint begin{100s};
  XrunEpisodes xruns;
  EXPECT_TRUE(xruns.addXrun(begin, 20ms));
  EXPECT_FALSE(xruns.addXrun(begin + 999ms, 20ms)) << "under a second";
  EXPECT_FALSE(xruns.addXrun(begin + 1900ms, 20ms)) << "counted from the last, not from the first";
  EXPECT_TRUE(xruns.addXrun(begin + 2900ms, 40ms)) << "a second";
  EXPECT_TRUE(xruns.addXrun(begin + 4000ms, 0ms)) << "over a second";
  EXPECT_EQ(xruns.episodes(), 3);
  EXPECT_DOUBLE_EQ(xruns.starved().count(), 0.1);
}

}  // namespace
}  // namespace tal
