// Xruns come in bursts, and a burst is one annoyance to the listener: this counts bursts.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

namespace tal {

class XrunEpisodes {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  /// Xruns that follow each other by less than this are one episode.
  static constexpr std::chrono::seconds kEpisodeGap{1};

  /// Counts one xrun that left the device without audio for `starved`.
  /// True when it begins an episode.
  bool addXrun(TimePoint when, std::chrono::duration<double> starved);

  std::int64_t episodes() const { return episodes_; }
  std::chrono::duration<double> starved() const { return starved_; }

 private:
  std::optional<TimePoint> last_;
  std::int64_t episodes_ = 0;
  std::chrono::duration<double> starved_{0};
};

}  // namespace tal
