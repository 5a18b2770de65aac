#include "tools/talctl/report/ReportWords.h"

#include <array>
#include <cmath>
#include <cstdio>

namespace tal::talctl {
namespace {

constexpr std::int64_t kMinute = 60;
constexpr std::int64_t kHour = 60 * kMinute;
// From here on minutes say nothing.
constexpr std::int64_t kManyHours = 100 * kHour;

/// With two digits at least.
std::string padded(std::int64_t number) {
  constexpr std::int64_t kTwoDigits = 10;
  std::string text = std::to_string(number);
  if (number < kTwoDigits) text.insert(text.begin(), '0');
  return text;
}

std::string formatted(const std::tm& parts, const char* form) {
  std::array<char, 80> text{};
  return {text.data(), std::strftime(text.data(), text.size(), form, &parts)};
}

std::tm localTime(double seconds_since_1970) {
  const auto seconds = static_cast<std::time_t>(seconds_since_1970);
  std::tm parts{};
  localtime_r(&seconds, &parts);
  return parts;
}

}  // namespace

std::string durationText(double seconds) {
  if (!(seconds > 0)) return "–";
  constexpr double kTenths = 10;
  if (seconds < kTenths - 0.05) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%.1f s", seconds);
    return text.data();
  }
  const std::int64_t whole = std::llround(seconds);
  if (whole < kMinute) return std::to_string(whole) + " s";
  if (whole < kHour) return std::to_string(whole / kMinute) + " min " + padded(whole % kMinute) + " s";
  const std::int64_t minutes = std::llround(seconds / kMinute);
  if (whole < kManyHours) {
    return std::to_string(minutes / kMinute) + " h " + padded(minutes % kMinute) + " min";
  }
  return numberText(static_cast<std::uint64_t>(std::llround(seconds / kHour))) + " h";
}

std::string percentText(double part) {
  constexpr double kWhole = 100;
  constexpr double kMost = 1e6;
  return numberText(static_cast<std::uint64_t>(std::llround(std::fmin(std::fmax(part, 0), kMost) * kWhole))) +
         " %";
}

std::string shareText(double part) {
  constexpr double kLeast = 0.005;
  return part > 0 && part < kLeast ? "<1 %" : percentText(part);
}

std::string numberText(std::uint64_t number) {
  constexpr std::size_t kGroup = 3;
  std::string text = std::to_string(number);
  for (std::size_t end = text.size(); end > kGroup; end -= kGroup) text.insert(end - kGroup, ",");
  return text;
}

std::string countText(std::uint64_t count, std::string_view one, std::string_view many) {
  return numberText(count) + ' ' + std::string(count == 1 ? one : many);
}

std::string timeText(double seconds_since_1970) {
  return formatted(localTime(seconds_since_1970), "%d %b %Y %H:%M");
}

std::string hourText(std::size_t hour) { return padded(static_cast<std::int64_t>(hour)) + ":00"; }

std::string periodText(const AudioReport& report) {
  const std::string until = formatted(localTime(report.until), "%d %b %Y %H:%M (%Z)");
  return report.since ? timeText(*report.since) + " to " + until : "until " + until;
}

std::string dateText(const std::tm& date, const char* form) { return formatted(date, form); }

std::string emptinessText(const AudioReport& report) {
  if (report.hasAudio()) return {};
  if (report.events == 0) return "Nothing was stored in this time.";
  return "Nothing was played or recorded in this time. What plays now is counted once its session has "
         "stopped.";
}

std::string originText(const AudioReport& report) {
  std::string text = "From " + countText(report.events, "stored event.", "stored events.");
  if (report.unreadable > 0) {
    text += ' ' + countText(report.unreadable, "of them is", "of them are") + " damaged and left out.";
  }
  if (report.hasAudio()) {
    text +=
        " What is playing or recording is counted once its session has stopped; on the time line its "
        "stretches"
        " end there, without the pauses between them.";
  }
  return text;
}

}  // namespace tal::talctl
