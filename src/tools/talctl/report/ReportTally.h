#pragma once

// Adds events up to what a report tells.

#include <array>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "tools/talctl/report/ReportedName.h"
#include "tools/talctl/report/Usage.h"

namespace tal::talctl {

/// Playing time in each of the volume buckets of the derived summaries, the softest first.
constexpr std::size_t kVolumeBucketCount = 17;
using VolumeSeconds = std::array<double, kVolumeBucketCount>;

/// Spans of the time line, in seconds: every time zone's hours begin with one.
constexpr std::int64_t kSlotSeconds = 900;

/// An application of one service.
struct ApplicationName {
  std::string application;
  std::string service;  ///< "" where events do not tell.
};

struct ErrorKind {
  std::string event;  ///< Category and type: "Error.IssueDetector".
  std::string issue;  ///< "" where the event does not tell.
  std::string application;
  bool operator<(const ErrorKind& other) const {
    return std::tie(event, issue, application) < std::tie(other.event, other.issue, other.application);
  }
};
struct ErrorCount {
  std::uint64_t count = 0;
  double last_at = 0;  ///< Seconds since 1970.
};

/// The sum of a sequence of events, in the order of the store. One thread.
///
/// Stretches are summed up when their session stops, without the time at which each was. On the time line
/// they are placed back to back, the last one ending at the stop; pauses between them are not known.
class ReportTally {
 public:
  void add(const ReportedName& name, double recorded_at, std::string_view payload);

  /// Adds what another one has seen. Call finish() on both first.
  void merge(const ReportTally& other);

  /// Places the stretches of a session whose last one is missing. Nothing is added after this.
  void finish();

  Usage total() const { return applications_.total(); }
  /// Every name of `applications` leads to one of these.
  static ApplicationName applicationOf(std::string_view name);
  const Breakdown& applications() const { return applications_; }
  const Breakdown& devices() const { return devices_; }
  const Breakdown& formats() const { return formats_; }
  const VolumeSeconds& volumes() const { return volumes_; }
  /// By start in seconds since 1970, divided by kSlotSeconds.
  const std::map<std::int64_t, Usage>& slots() const { return slots_; }
  const std::map<ErrorKind, ErrorCount>& errors() const { return errors_; }
  std::uint64_t rowsGivenUp() const { return rows_given_up_; }
  /// Events whose payload is no JSON object.
  std::uint64_t unreadable() const { return unreadable_; }

 private:
  using Seconds = double Usage::*;
  /// The stretches of one stopped session, as far as they have been met.
  struct Session {
    double ended_at = 0;
    std::vector<double> stretches;
  };

  void addPlaying(const ReportedName& name, double recorded_at, std::string_view payload);
  void addRecording(const ReportedName& name, double recorded_at, std::string_view payload);
  void addStreamEnd(const ReportedName& name, std::string_view payload);
  void addTrouble(const ReportedName& name, double recorded_at, std::string_view payload);
  Usage& application(std::string_view service, std::string_view value);
  void addStretch(Session& session, Seconds field, double recorded_at, double seconds, std::string_view index,
                  std::string_view count);
  void place(Session& session, Seconds field);
  void spread(double from, double to, Seconds field);

  Breakdown applications_;
  Breakdown devices_;
  Breakdown formats_;
  VolumeSeconds volumes_{};
  std::map<std::int64_t, Usage> slots_;
  std::map<ErrorKind, ErrorCount> errors_;
  std::uint64_t rows_given_up_ = 0;
  std::uint64_t unreadable_ = 0;
  Session playing_;
  Session recording_;
  std::string key_;
  std::string text_;
};

}  // namespace tal::talctl
