#include "platform/linux/driver_stats/PcmReading.h"

#include <algorithm>

#include "platform/linux/driver_stats/CounterDelta.h"
#include "platform/linux/driver_stats/TextLines.h"

namespace tal {

namespace {

constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;

// "12345.000000042"
std::int64_t nanosecondsOf(std::string_view word) {
  const auto point = word.find('.');
  if (point == std::string_view::npos) return 0;
  const auto seconds = numberOf<std::int64_t>(word.substr(0, point));
  const auto nanoseconds = numberOf<std::int64_t>(word.substr(point + 1));
  return seconds && nanoseconds ? *seconds * kNanosecondsPerSecond + *nanoseconds : 0;
}

// Calls with each key and the first word of its value.
template <typename Visit>
void forEachField(std::string_view text, const Visit& visit) {
  while (!text.empty()) {
    std::string_view line = takeLine(text);
    const auto colon = line.find(':');
    if (colon == std::string_view::npos) continue;
    std::string_view key = line.substr(0, colon);
    line.remove_prefix(colon + 1);
    visit(takeWord(key), takeWord(line));
  }
}

// As many as the hardware can have moved since the run was triggered.
double mostFramesSinceTrigger(const PcmStatus& status) {
  const auto nanoseconds = static_cast<double>(status.read_nanoseconds - status.trigger_nanoseconds);
  return nanoseconds / kNanosecondsPerSecond * static_cast<double>(status.rate) +
         static_cast<double>(status.buffer_size);
}

// False when the substream was prepared anew in between. A run that was paused has
// a new trigger time too, but more frames than can have passed since.
bool isSameRun(const PcmStatus& before, const PcmStatus& after) {
  if (before.owner_pid != after.owner_pid) return false;
  return before.trigger_nanoseconds == after.trigger_nanoseconds ||
         static_cast<double>(after.hardware_pointer) > mostFramesSinceTrigger(after);
}

}  // namespace

std::optional<PcmStatus> parsePcmStatus(std::string_view status, std::string_view hw_params) {
  PcmStatus parsed;
  bool has_pointer = false;
  forEachField(status, [&](std::string_view key, std::string_view value) {
    if (key == "owner_pid") parsed.owner_pid = numberOf<std::int64_t>(value).value_or(0);
    if (key == "trigger_time") parsed.trigger_nanoseconds = nanosecondsOf(value);
    if (key == "tstamp") parsed.read_nanoseconds = nanosecondsOf(value);
    if (key == "avail_max") parsed.largest_available = numberOf<std::uint64_t>(value).value_or(0);
    if (key == "hw_ptr") {
      const auto pointer = numberOf<std::uint64_t>(value);
      has_pointer = pointer.has_value();
      parsed.hardware_pointer = pointer.value_or(0);
    }
  });
  if (!has_pointer) return std::nullopt;
  forEachField(hw_params, [&](std::string_view key, std::string_view value) {
    if (key == "rate") parsed.rate = numberOf<std::uint64_t>(value).value_or(0);
    if (key == "buffer_size") parsed.buffer_size = numberOf<std::uint64_t>(value).value_or(0);
  });
  return parsed;
}

std::uint64_t pcmBoundary(std::uint64_t buffer_size, unsigned kernel_long_bits) {
  const std::uint64_t largest_long = largestOfBits(kernel_long_bits - 1);
  if (buffer_size == 0 || buffer_size > largest_long / 2) return largest_long;
  std::uint64_t boundary = buffer_size;
  while (boundary * 2 <= largest_long - buffer_size) boundary *= 2;
  return boundary;
}

std::uint64_t pcmFramesMoved(const PcmReading* before, const PcmReading& after) {
  if (!after.status) return 0;
  const PcmStatus& latest = *after.status;
  if (!before || !before->status || !isSameRun(*before->status, latest)) return latest.hardware_pointer;
  return counterDelta(before->status->hardware_pointer, latest.hardware_pointer,
                      pcmBoundary(latest.buffer_size, after.kernel_long_bits) - 1);
}

void PeakHistory::add(std::uint64_t number, std::uint64_t value) {
  stretches_.push_back({number, value});
  if (stretches_.size() <= kMostStretches) return;
  const std::uint64_t oldest = stretches_.front().value;
  stretches_.pop_front();
  stretches_.front().value = std::max(stretches_.front().value, oldest);
}

std::uint64_t PeakHistory::largest(std::uint64_t begin, std::uint64_t end) const {
  std::uint64_t largest = 0;
  for (const Stretch& stretch : stretches_) {
    if (stretch.number > begin && stretch.number <= end) largest = std::max(largest, stretch.value);
  }
  return largest;
}

}  // namespace tal
