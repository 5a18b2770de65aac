#pragma once

// The key vocabulary: every key that the system itself writes or reads, under
// the name that the code uses for it.

#include "core/MessageKey.h"

namespace tal {

// Written into messages by intake.
inline constexpr MessageKey TalReportingMessageKeyTalTimestamp{"talreporting_timestamp"};
inline constexpr MessageKey TalReportingInternalEventEpochTime = TalReportingMessageKeyTalTimestamp;
inline constexpr MessageKey TalReportingInternalEventSystemUptimeSec{"systemuptime_sec"};
inline constexpr MessageKey TalReportingInternalEventProcessUptimeMS{"processuptime_ms"};
inline constexpr MessageKey TalReportingMessageKeyInvalidTimestamp{"invalid_timestamp"};
inline constexpr MessageKey TalReportingMessageKeyAudioTag{"audiotag"};
inline constexpr MessageKey TalReportingApplicationName{"HostApplicationDisplayID"};

/// An alias in configurations, kept beside the application name.
inline constexpr MessageKey TalReportingConfigurationApplicationName{"RvHostApplicationDisplayID"};

inline constexpr MessageKey TalReportingMessageKeySendSingleMessage{"sendSingleMessage"};

// Written by clients, read by the workers that derive summaries.
inline constexpr MessageKey TalReportingMessageKeySessionOutputRunning{"session_output_running"};
inline constexpr MessageKey TalReportingMessageKeySessionInputRunning{"session_input_running"};
inline constexpr MessageKey TalReportingMessageKeySessionDuration{"session_duration"};
inline constexpr MessageKey TalReportingMessageKeySelectedFormat{"session_selected_format"};
inline constexpr MessageKey TalReportingMessageKeyActiveDevices{"active_devices"};
inline constexpr MessageKey TalReportingMessageKeyFormatID{"mFormatID"};
inline constexpr MessageKey TalReportingMessageKeyChannelsPerFrame{"mChannelsPerFrame"};
inline constexpr MessageKey TalReportingMessageKeySpatialAudioAccessoryFeature{
    "spatial-audio-accessory-feature"};
/// The settings domain that the feature is read from.
inline constexpr std::string_view TalReportingMessageKeySpatialAudioAccessoryFeatureDomain{
    "org.vantle.homeshell"};
inline constexpr MessageKey TalReportingMessageKeySpatializationEnabled{"spatializationEnabled"};
inline constexpr MessageKey TalReportingMessageKeyRingerState{"ringerstate"};
inline constexpr MessageKey TalReportingMessageKeyVolume{"RvSessionVolume"};
inline constexpr MessageKey TalReportingMessageKeyVpConfigOperationMode{"vp_config_operation_mode"};
inline constexpr MessageKey TalReportingMessageKeyVpConfigInputPort{"vp_config_input_port"};
inline constexpr MessageKey TalReportingMessageKeyVpConfigPrimaryVocoder{"vp_config_primary_vocoder"};
inline constexpr MessageKey TalReportingMessageKeyVpConfigPrimaryVocoderFs{"vp_config_primary_vocoderFs"};
inline constexpr MessageKey TalReportingMessageKeyIssueType{"issue_type"};
inline constexpr MessageKey TalReportingMessageKeyRtaidClient{"rtaid_client"};
inline constexpr MessageKey TalReportingMessageKeyNode{"node"};
inline constexpr MessageKey TalReportingMessageKeyAnyChannelSilenceSeconds{"any_channel_silence_seconds"};

// Written into derived summaries.
inline constexpr MessageKey TalReportingMessageKeyVolumeBucketed{"RvSessionVolumeBucketed"};
inline constexpr MessageKey TalReportingMessageKeyPlayseconds{"play_seconds"};
inline constexpr MessageKey TalReportingMessageKeyPlaysecondsBucketed{"play_secondsBucketed"};
inline constexpr MessageKey TalReportingMessageKeyInputrunningSeconds{"inputrunning_seconds"};
inline constexpr MessageKey TalReportingMessageKeyInputrunningSecondsBucketed{"inputrunning_secondsBucketed"};
inline constexpr MessageKey TalReportingMessageKeyVocoders{"vocoders"};
inline constexpr MessageKey TalReportingMessageKeyMessageIndex{"msgidx"};
inline constexpr MessageKey TalReportingMessageKeyMessageCount{"msgcnt"};

// Defined for clients; the service reads neither.
inline constexpr MessageKey TalReportingSessionComparisonFieldBlacklistKey{"_comparison_field_blacklist"};
inline constexpr MessageKey TalReportingSessionThrottleSecondsKey{"_throttle_seconds"};

// Reply dictionaries.
inline constexpr MessageKey TalReportingReplyKeyReporterID{"reporterID"};
inline constexpr MessageKey TalReportingReplyKeyServiceType{"serviceType"};

/// What stands for an application whose name nobody gave.
inline constexpr std::string_view kUnknownApplicationName = "Unknown";

}  // namespace tal
