#pragma once

// Interrupts by line and processor, as /proc/interrupts counts them.

#include <cstdint>
#include <map>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

namespace tal {

struct InterruptLine {
  std::uint32_t number = 0;
  /// By the processor's number: processors come and go.
  std::map<std::uint32_t, std::uint32_t> counts = {};
  /// What handles it, such as "snd_hda_intel:card0"; more than one is separated by ", ".
  std::string_view handlers = {};

  /// Whose interrupts those of a shared line are, the kernel does not count.
  bool isShared() const { return handlers.find(", ") != std::string_view::npos; }
};

/// The numbered lines. Refers to the text.
std::vector<InterruptLine> parseInterrupts(std::string_view text);

/// The lines of one sound card at one moment: counts by line and processor.
struct InterruptReading {
  std::map<std::pair<std::uint32_t, std::uint32_t>, std::uint32_t> counts = {};
};

/// Interrupts on the lines and processors that both readings have; nothing when
/// they have none in common.
std::optional<std::uint64_t> interruptsBetween(const InterruptReading& before, const InterruptReading& after);

}  // namespace tal
