#include "tools/talctl/report/Usage.h"

#include <algorithm>
#include <tuple>

namespace tal::talctl {

Usage& Usage::operator+=(const Usage& other) {
  played_seconds += other.played_seconds;
  recorded_seconds += other.recorded_seconds;
  volume_seconds += other.volume_seconds;
  starved_seconds += other.starved_seconds;
  stretches += other.stretches;
  overload_events += other.overload_events;
  xrun_episodes += other.xrun_episodes;
  errors += other.errors;
  return *this;
}

Usage& Breakdown::of(std::string_view name) {
  if (const auto found = usages_.find(name); found != usages_.end()) return found->second;
  if (usages_.size() < kMostNames) return usages_[std::string(name)];
  overflowed_ = true;
  return beyond_;
}

void Breakdown::merge(const Breakdown& other) {
  for (const auto& [name, usage] : other.usages_) of(name) += usage;
  beyond_ += other.beyond_;
  overflowed_ = overflowed_ || other.overflowed_;
}

Usage Breakdown::total() const {
  Usage total = beyond_;
  for (const auto& [name, usage] : usages_) total += usage;
  return total;
}

Ranking Breakdown::ranking(std::size_t most) const {
  Ranking ranking;
  for (const auto& [name, usage] : usages_) ranking.rows.push_back({name, usage});
  std::sort(ranking.rows.begin(), ranking.rows.end(), [](const Ranking::Row& a, const Ranking::Row& b) {
    const auto key = [](const Ranking::Row& row) {
      return std::tuple(-row.usage.seconds(), -static_cast<double>(row.usage.overloads() + row.usage.errors),
                        std::string_view(row.name));
    };
    return key(a) < key(b);
  });
  if (overflowed_) {
    ranking.others = beyond_;
    ranking.other_count = 1;
  }
  // One that would stand alone among the others can have its own row as well.
  if (!overflowed_ && ranking.rows.size() <= most + 1) return ranking;
  for (std::size_t i = most; i < ranking.rows.size(); ++i) ranking.others += ranking.rows[i].usage;
  if (ranking.rows.size() > most) {
    ranking.other_count += ranking.rows.size() - most;
    ranking.rows.resize(most);
  }
  return ranking;
}

}  // namespace tal::talctl
