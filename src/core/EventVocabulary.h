#pragma once

// The event vocabulary: what part of the audio system a message concerns, what
// happened there, and what kind of client a session serves, as numbers and as
// the strings under which analytics events are named.

#include <cstdint>
#include <string>
#include <string_view>

namespace tal {

/// What part of the audio system a message concerns: the category proper in the
/// low 16 bits, at most one domain flag in the high bits. Any 32-bit number may
/// come from a client.
enum class AudioEventCategory : std::uint32_t {
  kGeneric = 1,
  kRecord = 2,
  kInput = 3,
  kPlayback = 4,
  kOutput = 5,
  kPlaybackAndRecord = 6,
  kIO = 7,
  kSetup = 8,
  kClientRequest = 9,
  kRouteChange = 10,
  kError = 11,
  kDrvstats = 12,
  kPerformance = 13,
  kVolume = 14,
  kHuddle = 15,
  kHearingHealth = 16,
  kEarlet = 17,
  kUnknown = 0xFFFFFFFF,
};

inline constexpr std::uint32_t kAudioEventDomainMIDI = 0x04000000;
inline constexpr std::uint32_t kAudioEventDomainSession = 0x08000000;
inline constexpr std::uint32_t kAudioEventDomainDSP = 0x10000000;
inline constexpr std::uint32_t kAudioEventDomainHAL = 0x20000000;
inline constexpr std::uint32_t kAudioEventDomainRouting = 0x40000000;
inline constexpr std::uint32_t kAudioEventDomainToolbox = 0x80000000;

/// What happened. Any 16-bit number may come from a client.
enum class AudioEventType : std::uint16_t {
  kGeneric = 0,
  kStart = 1,
  kStop = 2,
  kActivate = 3,
  kDeactivate = 4,
  kSetup = 5,
  kError = 6,
  kIssueDetector = 7,
  kEnergylog = 8,
  kAudioUnitUsage = 9,
  kMIDIDriver = 10,
  kSummary = 11,
  kHeadphoneAudioExposure = 12,
  kAudioExposure = 13,
  kListeningenhancement = 14,
  kPercept = 15,
  kSimple = 16,
  kHistogram = 17,
  kState = 18,
  kMemoryLog = 19,
  kUnknown = 65535,
};

/// What kind of client a session serves. Any 16-bit number may come from a client.
enum class AudioServiceType : std::uint16_t {
  kGeneric = 0,
  kVoxa = 1,
  kTelephony = 2,
  kHaptics = 3,
  kAlarms = 4,
  kStandalone = 5,  ///< What the service gives its own single-message session.
  kSoundautoconfig = 6,
  kLongformaudio = 7,
  kNonlongformaudio = 8,
  kAudiodeviceusage = 9,
  kAlerts = 10,
  kTest = 11,  ///< On an internal build its start reply comes at once as well.
  kApiusage = 12,
  kSystemsounds = 13,
  kUnknown = 65535,  ///< No type set.
};

/// Chosen by the client, and the session's identifier as well. 0 never names a session.
using ReporterID = std::int64_t;

/// "Playback"; with high bits set, the name of the one domain flag (none for any
/// other high half) and "_" stand before it: "DSP_Playback", "_Playback". A low
/// half without a name is "Undefined", as is 0xFFFFFFFF.
std::string TalReportingUtilityCategoryString(AudioEventCategory category);

/// Exact look-up of the names of 1 to 16 and of "Unknown"; anything else is
/// 0xFFFFFFFF. "Earlet" is deliberately absent: no client may ask for it by name.
AudioEventCategory TalReportingUtilityCategoryFromString(std::string_view name);

/// The type's name; "Generic" for a number without one.
std::string_view TalReportingUtilityTypeString(AudioEventType type);

/// Exact look-up of the names of 0 to 18 and of "Unknown"; anything else is
/// Generic, not Unknown. "MemoryLog" is deliberately absent.
AudioEventType TalReportingUtilityTypeFromString(std::string_view name);

/// The service's name; "unknown" for a number above 13.
std::string_view TalReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType type);

/// Exact look-up; `kUnknown` for any other name.
AudioServiceType TalReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name);

/// True when a domain or other high bit is set (all-ones excluded).
bool TalReportingUtilityIsABTestModeOn(AudioEventCategory category);

/// Seconds that a stretch must exceed to be summarised: 0.5 for every service type.
double TalReportingUtilityVolumeMinimumPlayingTime(AudioServiceType type);

/// The session identifier of a reporter: the reporter ID itself.
constexpr ReporterID TalReportingUtilityExtractSessionIDFromReporterID(ReporterID reporter_id) {
  return reporter_id;
}

}  // namespace tal
