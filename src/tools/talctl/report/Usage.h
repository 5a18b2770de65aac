#pragma once

// What a report adds up, and for whom.

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace tal::talctl {

/// What one application, one device or one span of time amounts to.
struct Usage {
  double played_seconds = 0;
  double recorded_seconds = 0;
  double volume_seconds = 0;    ///< Each stretch's volume times its seconds.
  double starved_seconds = 0;   ///< Audio that went missing in overloads.
  std::uint64_t stretches = 0;  ///< Of playing and of recording.
  std::uint64_t overload_events = 0;
  std::uint64_t xrun_episodes = 0;
  std::uint64_t errors = 0;

  Usage& operator+=(const Usage& other);

  double seconds() const { return played_seconds + recorded_seconds; }
  /// An episode is told twice, when it begins and, as a number, when its stream ends; either may be missing.
  std::uint64_t overloads() const {
    return overload_events > xrun_episodes ? overload_events : xrun_episodes;
  }
  /// By playing time; 0 where nothing played.
  double meanVolume() const { return played_seconds > 0 ? volume_seconds / played_seconds : 0; }
};

/// The entries of a breakdown that matter most, the first before the others.
struct Ranking {
  struct Row {
    std::string name;
    Usage usage;
  };
  std::vector<Row> rows;
  /// What stands for all that have no row, and how many these are.
  Usage others;
  std::size_t other_count = 0;
};

/// Usage by name. Names come from clients: past a number that no device reaches in earnest, further ones are
/// added up as one.
class Breakdown {
 public:
  static constexpr std::size_t kMostNames = 10000;

  Usage& of(std::string_view name);
  void merge(const Breakdown& other);

  Usage total() const;

  /// The `most` longest in use, then the most troubled, then by name.
  Ranking ranking(std::size_t most) const;

 private:
  struct Hash : std::hash<std::string_view> {
    using is_transparent = void;
  };
  std::unordered_map<std::string, Usage, Hash, std::equal_to<>> usages_;
  Usage beyond_;
  bool overflowed_ = false;
};

}  // namespace tal::talctl
