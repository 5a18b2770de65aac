#pragma once

// One substream of a sound card, as /proc/asound shows it.

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <string_view>

namespace tal {

/// What a substream's "status" and "hw_params" say.
struct PcmStatus {
  std::int64_t owner_pid = 0;
  /// Of the last start, stop, pause or resume, and of the reading; on one clock.
  std::int64_t trigger_nanoseconds = 0;
  std::int64_t read_nanoseconds = 0;
  /// Frames since the substream was prepared; starts again from 0 at its boundary.
  std::uint64_t hardware_pointer = 0;
  /// The most frames that were ready to be read or had room to be written, since
  /// anyone last read the status.
  std::uint64_t largest_available = 0;
  std::uint64_t rate = 0;         ///< frames per second; 0 when not set up
  std::uint64_t buffer_size = 0;  ///< frames; 0 when not set up
};

/// Nothing for a closed substream, or for text of another form.
std::optional<PcmStatus> parsePcmStatus(std::string_view status, std::string_view hw_params);

/// Where the kernel lets the hardware pointer start again: the buffer size doubled
/// as often as a long of so many bits can hold.
std::uint64_t pcmBoundary(std::uint64_t buffer_size, unsigned kernel_long_bits);

/// A substream at one moment; closed when there is no status.
struct PcmReading {
  std::optional<PcmStatus> status;
  unsigned kernel_long_bits = 64;
};

/// Frames that the substream moved. The kernel forgets the frames of a run when
/// the next one is prepared: then it is those of the last run, so never too many.
std::uint64_t pcmFramesMoved(const PcmReading* before, const PcmReading& after);

/// The largest value of each stretch between two readings. A reading makes the
/// kernel begin anew, so what one session reads would be lost to those that
/// overlap it.
class PeakHistory {
 public:
  /// The stretch that ends with the reading of this number, above all earlier ones.
  void add(std::uint64_t number, std::uint64_t value);
  /// Of all stretches that end after reading `begin` and not after `end`; 0 without any.
  std::uint64_t largest(std::uint64_t begin, std::uint64_t end) const;

 private:
  // The oldest of more are merged: a session that began amid them may then see the
  // peak of a stretch before it.
  static constexpr std::size_t kMostStretches = 64;

  struct Stretch {
    std::uint64_t number;
    std::uint64_t value;
  };
  std::deque<Stretch> stretches_;
};

/// The reading of this number, and what is known of the stretches between readings.
struct PeakReading {
  std::shared_ptr<const PeakHistory> history;
  std::uint64_t number = 0;
};

}  // namespace tal
