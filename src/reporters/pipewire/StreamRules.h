// The small rules that turn what an audio graph says about a stream into what a report says.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "reporters/pipewire/ReportMessage.h"

namespace tal {

/// What an application says about itself; an empty text was not said.
struct ApplicationNames {
  std::string id;
  std::string binary;
  std::string name;

  bool operator==(const ApplicationNames&) const = default;
};

/// The volume of one node: linear factors, not perceived loudness.
struct NodeVolume {
  double volume = 1.0;
  /// One factor per channel; empty counts as 1.
  std::vector<double> channelVolumes;
  bool mute = false;

  bool operator==(const NodeVolume&) const = default;
};

/// The format in which an application delivers or takes its audio.
struct AudioFormat {
  /// Such as "raw" or "iec958".
  std::string encoding;
  /// Such as "S16LE"; empty when the encoding has no sample format.
  std::string sampleFormat;
  /// In Hz; 0 when not known.
  std::uint32_t rate = 0;
  /// 0 when not known.
  std::uint32_t channels = 0;

  bool operator==(const AudioFormat&) const = default;
};

ReportServiceType serviceTypeForRole(std::string_view mediaRole);

/// The name to report an application under: its id, else its binary's name, else its name.
/// A stream's own words go before those of the client that it belongs to. Empty when none was said.
std::string applicationNameOf(const ApplicationNames& stream, const ApplicationNames& client);

/// The linear gain of one node: 0 when it is muted.
double gainOf(const NodeVolume& volume);

/// Such as "S16LE 44100 Hz"; an encoding without a sample format stands in its place.
std::string formatText(const AudioFormat& format);

/// The text with every byte that is not part of well-formed UTF-8 replaced by U+FFFD: nobody
/// checks what programs write into their properties, and a message takes well-formed text only.
std::string validUtf8(std::string_view text);

}  // namespace tal
