#include "core/EventVocabulary.h"

#include <array>
#include <optional>
#include <span>

namespace tal {

namespace {

constexpr std::uint32_t kLowHalf = 0xFFFF;

// By value, from 0.
constexpr std::array<std::string_view, 18> kCategoryNames{
    "Undefined",         "Generic",     "Record", "Input",         "Playback",      "Output",
    "PlaybackAndRecord", "IO",          "Setup",  "ClientRequest", "RouteChange",   "Error",
    "Drvstats",          "Performance", "Volume", "Huddle",        "HearingHealth", "Earlet"};
constexpr std::size_t kCategoriesFoundByName = 17;  // up to "HearingHealth"

constexpr std::array<std::string_view, 20> kTypeNames{"Generic",
                                                      "Start",
                                                      "Stop",
                                                      "Activate",
                                                      "Deactivate",
                                                      "Setup",
                                                      "Error",
                                                      "IssueDetector",
                                                      "Energylog",
                                                      "AudioUnitUsage",
                                                      "MIDIDriver",
                                                      "Summary",
                                                      "HeadphoneAudioExposure",
                                                      "AudioExposure",
                                                      "Listeningenhancement",
                                                      "Percept",
                                                      "Simple",
                                                      "Histogram",
                                                      "State",
                                                      "MemoryLog"};
constexpr std::size_t kTypesFoundByName = 19;  // up to "State"

constexpr std::array<std::string_view, 14> kServiceNames{
    "generic",         "voxa",          "telephony",        "haptics",          "alarms", "standalone",
    "soundautoconfig", "longformaudio", "nonlongformaudio", "audiodeviceusage", "alerts", "test",
    "apiusage",        "systemsounds"};

std::optional<std::size_t> positionOf(std::string_view name, std::span<const std::string_view> names) {
  for (std::size_t i = 0; i < names.size(); ++i) {
    if (names[i] == name) return i;
  }
  return std::nullopt;
}

std::string_view domainName(std::uint32_t flag) {
  switch (flag) {
    case kAudioEventDomainMIDI:
      return "MIDI";
    case kAudioEventDomainSession:
      return "Session";
    case kAudioEventDomainDSP:
      return "DSP";
    case kAudioEventDomainHAL:
      return "HAL";
    case kAudioEventDomainRouting:
      return "Routing";
    case kAudioEventDomainToolbox:
      return "Toolbox";
    default:
      return "";
  }
}

}  // namespace

bool TalReportingUtilityIsABTestModeOn(AudioEventCategory category) {
  return static_cast<std::uint32_t>(category) > kLowHalf && category != AudioEventCategory::kUnknown;
}

std::string TalReportingUtilityCategoryString(AudioEventCategory category) {
  const auto value = static_cast<std::uint32_t>(category);
  std::string text;
  if (TalReportingUtilityIsABTestModeOn(category)) {
    text += domainName(value & ~kLowHalf);
    text += '_';
  }
  const std::uint32_t low = value & kLowHalf;
  text += low < kCategoryNames.size() ? kCategoryNames[low] : kCategoryNames[0];
  return text;
}

AudioEventCategory TalReportingUtilityCategoryFromString(std::string_view name) {
  const auto found = positionOf(name, std::span(kCategoryNames).first(kCategoriesFoundByName));
  // Position 0 is the name of what has none.
  return found.value_or(0) == 0 ? AudioEventCategory::kUnknown : static_cast<AudioEventCategory>(*found);
}

std::string_view TalReportingUtilityTypeString(AudioEventType type) {
  if (type == AudioEventType::kUnknown) return "Unknown";
  const auto value = static_cast<std::size_t>(type);
  return value < kTypeNames.size() ? kTypeNames[value] : kTypeNames[0];
}

AudioEventType TalReportingUtilityTypeFromString(std::string_view name) {
  if (name == "Unknown") return AudioEventType::kUnknown;
  return static_cast<AudioEventType>(
      positionOf(name, std::span(kTypeNames).first(kTypesFoundByName)).value_or(0));
}

std::string_view TalReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType type) {
  const auto value = static_cast<std::size_t>(type);
  return value < kServiceNames.size() ? kServiceNames[value] : "unknown";
}

AudioServiceType TalReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name) {
  const auto found = positionOf(name, kServiceNames);
  return found ? static_cast<AudioServiceType>(*found) : AudioServiceType::kUnknown;
}

double TalReportingUtilityVolumeMinimumPlayingTime(AudioServiceType) {
  constexpr double kSeconds = 0.5;
  return kSeconds;
}

}  // namespace tal
