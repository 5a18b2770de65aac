#pragma once

// Figures as both forms of a report write them.

#include <cstdint>
#include <string>
#include <string_view>

#include "tools/talctl/report/AudioReport.h"

namespace tal::talctl {

/// "0.4 s", "12 s", "3 min 20 s", "2 h 05 min", "130 h"; "–" for nothing.
std::string durationText(double seconds);

/// "40 %".
std::string percentText(double part);
/// The same, but "<1 %" for what would read as nothing.
std::string shareText(double part);

/// "1 overload", "12,345 overloads".
std::string countText(std::uint64_t count, std::string_view one, std::string_view many);
std::string numberText(std::uint64_t number);

/// "21 Nov 2026 14:05", local time.
std::string timeText(double seconds_since_1970);

/// "06:00"; 24 for the end of a day.
std::string hourText(std::size_t hour);

/// The whole time that the report is about: "14 Nov 2026 14:05 to 21 Nov 2026 14:05 (CET)".
std::string periodText(const AudioReport& report);

/// A date in the form of strftime: kLongDate "Sat 21 Nov", kShortDate "21 Nov".
inline constexpr const char* kLongDate = "%a %d %b";
inline constexpr const char* kShortDate = "%d %b";
std::string dateText(const std::tm& date, const char* form);

/// Why there is nothing to show, where there is nothing; else "".
std::string emptinessText(const AudioReport& report);

/// What a reader should know of how the figures came about.
std::string originText(const AudioReport& report);

}  // namespace tal::talctl
