#pragma once

// The real daemon in a directory of its own, for as long as one measurement.

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <string>

namespace tal::bench {

/// Ends the program by an exception when something fails.
class DaemonUnderTest {
 public:
  struct Options {
    /// The setting `wanted` of the analytics, as TOML.
    std::string wanted = "[]";
    /// Whether real-time messages are kept in the store.
    bool rtc_store = false;
    /// "error" leaves only the time that the lines themselves do not take.
    std::string log_level = "default";
  };

  /// Returns when the daemon has said that it is ready.
  explicit DaemonUnderTest(const Options& options);
  DaemonUnderTest(const DaemonUnderTest&) = delete;
  DaemonUnderTest& operator=(const DaemonUnderTest&) = delete;
  ~DaemonUnderTest();

  std::filesystem::path socketPath() const { return root_ / "run" / "talreporting.sock"; }

  /// From the start of the program to its telling that it is ready.
  std::chrono::nanoseconds startTime() const { return start_time_; }

  std::size_t residentBytes() const;
  /// How often its threads have gone to sleep and been woken.
  std::uint64_t voluntarySwitches() const;
  /// Processor time of the whole process.
  std::chrono::nanoseconds processorTime() const;

  /// Ends it in order and returns the number of events of this name in its store.
  std::uint64_t endAndCountEvents(const std::string& name);
  /// Ends it in order and returns the number of real-time messages of this category.
  std::uint64_t endAndCountRtcMessages(int category);

 private:
  void writeSetting(const std::string& domain, const std::string& text) const;
  void start(const std::string& log_level);
  void end();
  std::uint64_t count(const std::string& query, const std::string& parameter) const;
  std::string statusField(const std::filesystem::path& file, const std::string& name) const;

  std::filesystem::path root_;
  pid_t process_ = -1;
  std::chrono::nanoseconds start_time_{};
};

}  // namespace tal::bench
