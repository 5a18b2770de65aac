#include "tools/talctl/Duration.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <string>

#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

using std::chrono::milliseconds;

constexpr milliseconds kLongest = std::chrono::hours(24 * 365 * 100);

struct Unit {
  std::string_view name;
  milliseconds length;
};
constexpr Unit kUnits[] = {
    {"ms", milliseconds(1)},      {"s", std::chrono::seconds(1)}, {"m", std::chrono::minutes(1)},
    {"h", std::chrono::hours(1)}, {"d", std::chrono::hours(24)},  {"w", std::chrono::hours(24 * 7)},
};

}  // namespace

milliseconds parseDuration(std::string_view text) {
  const UsageError wrong("'" + std::string(text) + "' is not a duration such as 90s, 10m, 2h, 7d or 1h30m");
  milliseconds total{0};
  std::string_view rest = text;
  do {
    std::uint64_t count = 0;
    const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), count);
    if (error != std::errc()) throw wrong;
    rest.remove_prefix(static_cast<std::size_t>(end - rest.data()));

    const std::string_view name = rest.substr(0, rest.find_first_of("0123456789"));
    const auto* const unit = std::find_if(std::begin(kUnits), std::end(kUnits),
                                          [&](const Unit& candidate) { return candidate.name == name; });
    if (unit == std::end(kUnits)) throw wrong;
    if (count > static_cast<std::uint64_t>((kLongest - total) / unit->length)) throw wrong;
    total += static_cast<std::int64_t>(count) * unit->length;
    rest.remove_prefix(name.size());
  } while (!rest.empty());
  return total;
}

}  // namespace tal::talctl
