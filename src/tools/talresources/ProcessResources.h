#pragma once

// What one process uses of processor and memory, as the kernel's /proc tells it.

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// An amount, and the two parts that it is made of.
struct ResourceAmount {
  std::uint64_t total = 0;
  std::uint64_t first = 0;
  std::uint64_t second = 0;
};

struct ProcessResources {
  std::int32_t process_identifier = 0;
  std::string name;
  ResourceAmount cpu_ms;     ///< in user code, in the kernel
  ResourceAmount phys_kib;   ///< resident: anonymous, files and shared
  ResourceAmount wired_kib;  ///< never swapped out: locked, pinned
  /// Resident memory by shares, as phys_kib. Nothing where the kernel does not
  /// tell this user.
  std::optional<ResourceAmount> footprint_kib;
};

/// Reads one /proc after the other, with one buffer. One thread.
class ProcessReader {
 public:
  /// `proc` is "/proc" but in tests.
  explicit ProcessReader(std::filesystem::path proc);

  /// In the order of their identifiers.
  std::vector<std::int32_t> processIdentifiers() const;

  /// Nothing for a process that has ended meanwhile, and for a thread of the
  /// kernel, which has no memory of its own.
  std::optional<ProcessResources> read(std::int32_t process_identifier);

 private:
  enum class Outcome { kRead, kDenied, kGone };

  Outcome readFile(std::int32_t process_identifier, const char* name);
  bool readFootprint(ProcessResources& resources);
  std::string_view content() const { return {buffer_.data(), size_}; }

  const std::filesystem::path proc_;
  std::string path_;  // kept for its memory
  std::vector<char> buffer_;
  std::size_t size_ = 0;
};

// Of the files' contents; for ProcessReader and its tests.

struct ProcessStat {
  std::string name;
  char state = '?';
  std::uint64_t flags = 0;
  std::uint64_t user_ticks = 0;
  std::uint64_t system_ticks = 0;
};

/// /proc/<pid>/stat; nothing when it is none.
std::optional<ProcessStat> parseProcessStat(std::string_view text);

/// The number of a line "<key>:  <number> kB" of /proc/<pid>/status and the like; 0 when
/// there is none.
std::uint64_t kibibytesOf(std::string_view text, std::string_view key);

}  // namespace tal
