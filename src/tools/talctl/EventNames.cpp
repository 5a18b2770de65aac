#include "tools/talctl/EventNames.h"

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <limits>
#include <optional>
#include <string>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

// Asked for all numbers up to these, the vocabulary names everything that has a name but "Unknown". Going
// through it that way also finds the two names that it refuses to look up for clients: this is a tool for
// the people who run the daemon.
constexpr std::uint32_t kLastCategory = 17;
constexpr std::uint16_t kLastType = 19;
constexpr std::uint16_t kLastService = 13;
constexpr std::uint32_t kDomains[] = {0,
                                      kAudioEventDomainMIDI,
                                      kAudioEventDomainSession,
                                      kAudioEventDomainDSP,
                                      kAudioEventDomainHAL,
                                      kAudioEventDomainRouting,
                                      kAudioEventDomainToolbox};

char lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

bool sameName(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char x, char y) { return lower(x) == lower(y); });
}

/// The number that the text spells, decimal or with 0x in front; nothing where it is no number or over
/// `most`.
std::optional<std::uint32_t> number(std::string_view text, std::uint32_t most) {
  const bool hex = text.starts_with("0x") || text.starts_with("0X");
  if (hex) text.remove_prefix(2);
  std::uint32_t value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value, hex ? 16 : 10);
  if (error != std::errc() || end != text.data() + text.size() || value > most) return std::nullopt;
  return value;
}

UsageError unknown(std::string_view what, std::string_view text) {
  return UsageError("'" + std::string(text) + "' is no " + std::string(what) +
                    ": give its number or its name");
}

}  // namespace

AudioEventCategory parseCategory(std::string_view text) {
  if (const auto value = number(text, std::numeric_limits<std::uint32_t>::max())) {
    return AudioEventCategory{*value};
  }
  for (const std::uint32_t domain : kDomains) {
    for (std::uint32_t low = 1; low <= kLastCategory; ++low) {
      const AudioEventCategory category{domain | low};
      if (sameName(text, TalReportingUtilityCategoryString(category))) return category;
    }
  }
  if (sameName(text, "Unknown")) return AudioEventCategory::kUnknown;
  throw unknown("category", text);
}

AudioEventType parseType(std::string_view text) {
  if (const auto value = number(text, std::numeric_limits<std::uint16_t>::max())) {
    return AudioEventType{static_cast<std::uint16_t>(*value)};
  }
  for (std::uint16_t value = 0; value <= kLastType; ++value) {
    if (sameName(text, TalReportingUtilityTypeString(AudioEventType{value}))) return AudioEventType{value};
  }
  if (sameName(text, "Unknown")) return AudioEventType::kUnknown;
  throw unknown("type", text);
}

AudioServiceType parseService(std::string_view text) {
  if (const auto value = number(text, std::numeric_limits<std::uint16_t>::max())) {
    return AudioServiceType{static_cast<std::uint16_t>(*value)};
  }
  for (std::uint16_t value = 0; value <= kLastService; ++value) {
    const AudioServiceType service{value};
    if (sameName(text, TalReportingUtilityGenerateServiceNameFromServiceType(service))) return service;
  }
  if (sameName(text, "unknown")) return AudioServiceType::kUnknown;
  throw unknown("service", text);
}

}  // namespace tal::talctl
