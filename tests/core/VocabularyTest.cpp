#include <gtest/gtest.h>

#include <vector>

#include "core/EventVocabulary.h"

namespace tal {
namespace {

TEST(EventVocabulary, CategoryStrings) {
  const std::vector<std::pair<std::uint32_t, std::string>> rows{
      {4, "Playback"},
      {17, "Earlet"},
      {0, "Undefined"},
      {18, "Undefined"},
      {0xFFFF, "Undefined"},
      {0xFFFFFFFF, "Undefined"},
      {0x10000, "_Undefined"},
      {0x00030004, "_Playback"},
      {0xFFFFFFFE, "_Undefined"},
      {kAudioEventDomainMIDI | 1, "MIDI_Generic"},
      {kAudioEventDomainSession | 2, "Session_Record"},
      {kAudioEventDomainDSP | 15, "DSP_Huddle"},
      {kAudioEventDomainHAL | 10, "HAL_RouteChange"},
      {kAudioEventDomainRouting | 14, "Routing_Volume"},
      {kAudioEventDomainToolbox | 99, "Toolbox_Undefined"},
      {kAudioEventDomainDSP | kAudioEventDomainHAL | 4, "_Playback"}};
  for (const auto& [value, text] : rows) {
    EXPECT_EQ(TalReportingUtilityCategoryString(static_cast<AudioEventCategory>(value)), text) << value;
  }
}

TEST(EventVocabulary, NamesLeadBackExceptForTheGaps) {
  for (std::uint32_t value = 1; value <= 16; ++value) {
    const auto category = static_cast<AudioEventCategory>(value);
    EXPECT_EQ(TalReportingUtilityCategoryFromString(TalReportingUtilityCategoryString(category)), category);
  }
  for (const char* name : {"Earlet", "Undefined", "DSP_Playback", "playback", "", "Unknown"}) {
    EXPECT_EQ(TalReportingUtilityCategoryFromString(name), AudioEventCategory::kUnknown) << name;
  }
  for (std::uint16_t value = 0; value <= 18; ++value) {
    const auto type = static_cast<AudioEventType>(value);
    EXPECT_EQ(TalReportingUtilityTypeFromString(TalReportingUtilityTypeString(type)), type);
  }
  EXPECT_EQ(TalReportingUtilityTypeString(AudioEventType::kMemoryLog), "MemoryLog");
  EXPECT_EQ(TalReportingUtilityTypeString(static_cast<AudioEventType>(20)), "Generic");
  EXPECT_EQ(TalReportingUtilityTypeString(AudioEventType::kUnknown), "Unknown");
  EXPECT_EQ(TalReportingUtilityTypeFromString("MemoryLog"), AudioEventType::kGeneric);
  EXPECT_EQ(TalReportingUtilityTypeFromString("nonsense"), AudioEventType::kGeneric);
  EXPECT_EQ(TalReportingUtilityTypeFromString("Unknown"), AudioEventType::kUnknown);
  for (std::uint16_t value = 0; value <= 13; ++value) {
    const auto type = static_cast<AudioServiceType>(value);
    EXPECT_EQ(TalReportingUtilityGenerateServiceTypeFromServiceName(
                  TalReportingUtilityGenerateServiceNameFromServiceType(type)),
              type);
  }
  EXPECT_EQ(TalReportingUtilityGenerateServiceNameFromServiceType(static_cast<AudioServiceType>(14)),
            "unknown");
  EXPECT_EQ(TalReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType::kUnknown), "unknown");
  for (const char* name : {"unknown", "Telephony", ""}) {
    EXPECT_EQ(TalReportingUtilityGenerateServiceTypeFromServiceName(name), AudioServiceType::kUnknown)
        << name;
  }
}

TEST(EventVocabulary, ABTestModeIsAHighBitButNotAllOnes) {
  const std::vector<std::pair<std::uint32_t, bool>> rows{
      {0, false}, {0xFFFF, false}, {0x10000, true}, {0xFFFFFFFE, true}, {0xFFFFFFFF, false}};
  for (const auto& [value, on] : rows) {
    EXPECT_EQ(TalReportingUtilityIsABTestModeOn(static_cast<AudioEventCategory>(value)), on) << value;
  }
}

}  // namespace
}  // namespace tal
