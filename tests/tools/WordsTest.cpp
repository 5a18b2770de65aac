// What people type in words: durations, and the names of categories, types and services.

#include <gtest/gtest.h>

#include <string>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/Duration.h"
#include "tools/talctl/EventNames.h"

namespace tal::talctl {
namespace {

using namespace std::chrono_literals;

TEST(Duration, IsTheSumOfItsParts) {
  const struct {
    const char* text;
    std::chrono::milliseconds expected;
  } rows[] = {{"500ms", 500ms}, {"90s", 90s},     {"10m", 10min}, {"2h", 2h},        {"7d", 168h},
              {"1w", 168h},     {"1h30m", 90min}, {"0s", 0s},     {"1s1ms", 1001ms}, {"100w", 16800h}};
  for (const auto& row : rows) EXPECT_EQ(parseDuration(row.text), row.expected) << row.text;
}

TEST(Duration, WantsACountAndAUnit) {
  for (const char* text : {"", "10", "m", "1.5h", "-1h", "1 h", "1h 30m", "1y", "10M", "1h30", "101y",
                           "5300w", "99999999999999999999s", "9223372036854775807w"}) {
    EXPECT_THROW(parseDuration(text), UsageError) << text;
  }
}

TEST(EventNames, AreNumbersOrTheNamesUnderWhichEventsAreStored) {
  const struct {
    const char* text;
    std::uint32_t expected;
  } categories[] = {{"Playback", 4},
                    {"playback", 4},
                    {"4", 4},
                    {"IO", 7},
                    {"Earlet", 17},
                    {"DSP_Playback", 0x10000004},
                    {"toolbox_Huddle", 0x8000000F},
                    {"0x10000004", 0x10000004},
                    {"Unknown", 0xFFFFFFFF},
                    {"4294967295", 0xFFFFFFFF},
                    {"0", 0},
                    {"99", 99}};
  for (const auto& row : categories) {
    EXPECT_EQ(static_cast<std::uint32_t>(parseCategory(row.text)), row.expected) << row.text;
  }
  const struct {
    const char* text;
    std::uint16_t expected;
  } types[] = {{"Start", 1},      {"start", 1},       {"Generic", 0},
               {"MemoryLog", 19}, {"Unknown", 65535}, {"65535", 65535}};
  for (const auto& row : types) {
    EXPECT_EQ(static_cast<std::uint16_t>(parseType(row.text)), row.expected) << row.text;
  }
  EXPECT_EQ(parseService("LongFormAudio"), AudioServiceType::kLongformaudio);
  EXPECT_EQ(parseService("13"), AudioServiceType::kSystemsounds);
  EXPECT_EQ(parseService("unknown"), AudioServiceType::kUnknown);
}

TEST(EventNames, AreRefusedWhereThereIsNoSuchOne) {
  for (const char* text :
       {"", "Playbac", "Playbackx", "Undefined", "DSP_", "_Playback", "-1", "4294967296", "0x", "4 "}) {
    EXPECT_THROW(parseCategory(text), UsageError) << text;
  }
  for (const char* text : {"", "Begin", "65536", "1.0"}) EXPECT_THROW(parseType(text), UsageError) << text;
  for (const char* text : {"", "music", "65536"}) EXPECT_THROW(parseService(text), UsageError) << text;
}

}  // namespace
}  // namespace tal::talctl
