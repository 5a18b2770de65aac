#include "reporters/pipewire/StreamRules.h"

#include <algorithm>
#include <cstddef>
#include <numeric>

namespace tal {

namespace {

/// Bytes of the well-formed character that `text` begins with; 0 when it begins with none.
std::size_t characterBytes(std::string_view text) {
  const auto byte = [&](std::size_t index) { return static_cast<unsigned char>(text[index]); };
  const unsigned lead = byte(0);
  if (lead < 0x80) return 1;
  const std::size_t bytes = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC2 || lead > 0xF4 || text.size() < bytes) return 0;
  for (std::size_t i = 1; i < bytes; ++i) {
    if ((byte(i) & 0xC0U) != 0x80U) return 0;
  }
  // Longer than needed, a surrogate, or beyond the last character.
  const unsigned second = byte(1);
  if ((lead == 0xE0 && second < 0xA0) || (lead == 0xED && second > 0x9F)) return 0;
  if ((lead == 0xF0 && second < 0x90) || (lead == 0xF4 && second > 0x8F)) return 0;
  return bytes;
}

}  // namespace

ReportServiceType serviceTypeForRole(std::string_view mediaRole) {
  if (mediaRole == "Music" || mediaRole == "Movie") return ReportServiceType::kLongFormAudio;
  if (mediaRole == "Communication" || mediaRole == "Phone") return ReportServiceType::kTelephony;
  if (mediaRole == "Alarm") return ReportServiceType::kAlarms;
  if (mediaRole == "Notification" || mediaRole == "Event") return ReportServiceType::kSystemSounds;
  return ReportServiceType::kNonLongFormAudio;
}

std::string applicationNameOf(const ApplicationNames& stream, const ApplicationNames& client) {
  for (const std::string* name :
       {&stream.id, &client.id, &stream.binary, &client.binary, &stream.name, &client.name}) {
    if (!name->empty()) return *name;
  }
  return {};
}

double gainOf(const NodeVolume& volume) {
  if (volume.mute) return 0.0;
  if (volume.channelVolumes.empty()) return volume.volume;
  const double sum = std::accumulate(volume.channelVolumes.begin(), volume.channelVolumes.end(), 0.0);
  return volume.volume * sum / static_cast<double>(volume.channelVolumes.size());
}

std::string formatText(const AudioFormat& format) {
  std::string text = format.sampleFormat.empty() ? format.encoding : format.sampleFormat;
  if (format.rate != 0) text += " " + std::to_string(format.rate) + " Hz";
  return text;
}

std::string validUtf8(std::string_view text) {
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const std::size_t bytes = characterBytes(text);
    result += bytes == 0 ? std::string_view("\xEF\xBF\xBD") : text.substr(0, bytes);
    text.remove_prefix(std::max<std::size_t>(bytes, 1));
  }
  return result;
}

}  // namespace tal
