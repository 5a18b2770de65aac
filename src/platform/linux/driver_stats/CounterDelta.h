#pragma once

#include <cstdint>
#include <limits>

namespace tal {

/// The largest value of a counter of so many bits, 1 to 64.
constexpr std::uint64_t largestOfBits(unsigned bits) {
  return std::numeric_limits<std::uint64_t>::max() >> (64 - bits);
}

/// True when a counter that counts up to `largest` and then from 0 cannot have
/// come from `before` to `after` by counting: it was set back in between. One that
/// reads lower has overflown if less than half of its range lies between the
/// readings; to cross more than that takes longer than a session lasts.
constexpr bool counterRestarted(std::uint64_t before, std::uint64_t after, std::uint64_t largest) {
  return after < before && (before > largest || largest - before + after >= largest / 2);
}

/// What was counted between two readings: of a counter that was set back, what it
/// has counted since.
constexpr std::uint64_t counterDelta(std::uint64_t before, std::uint64_t after, std::uint64_t largest) {
  if (after >= before) return after - before;
  return counterRestarted(before, after, largest) ? after : largest - before + after + 1;
}

}  // namespace tal
