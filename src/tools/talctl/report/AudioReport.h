#pragma once

// What a report shows, in whatever form it is shown.

#include <array>
#include <cstdint>
#include <ctime>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/talctl/report/ReportReader.h"

namespace tal::talctl {

/// How much of everything a report lists; the rest is added up.
struct ReportLimits {
  std::size_t names = 15;
  std::size_t errors = 15;
  std::size_t days = 31;
};

struct AudioReport {
  struct Day {
    std::tm date{};  ///< Its noon, local time.
    Usage usage;
  };
  using Error = std::pair<ErrorKind, ErrorCount>;

  std::optional<double> since;  ///< Seconds since 1970; nothing: all that is stored.
  double until = 0;
  std::optional<double> last_at;  ///< The newest event read; nothing without any.
  std::uint64_t events = 0;
  std::uint64_t unreadable = 0;
  std::uint64_t rows_given_up = 0;

  Usage total;
  Ranking applications;  ///< Names as ReportTally::applicationOf reads them.
  Ranking devices;
  Ranking formats;
  VolumeSeconds volumes{};
  std::array<Usage, 24> hours;  ///< Of the day, local time.
  std::vector<Day> days;        ///< The latest ones in a row, without gaps, local time.
  Usage earlier;                ///< What was on days before these.
  std::vector<Error> errors;    ///< The most frequent first.
  std::uint64_t other_errors = 0;

  /// Whether there is anything to show but errors.
  bool hasAudio() const { return total.seconds() > 0; }
  bool hasTrouble() const { return total.overloads() > 0 || total.errors > 0 || rows_given_up > 0; }
};

/// `since` and `until` are what was asked for, in seconds since 1970.
AudioReport makeReport(const StoreReading& reading, std::optional<double> since, double until,
                       const ReportLimits& limits);

}  // namespace tal::talctl
