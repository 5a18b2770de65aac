// What the drivers' statistics cost the reporting queue: a session's snapshot and
// its report, on a machine with 4 cards of 8 running substreams each.

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <system_error>

#include "core/Log.h"
#include "drivers/TalReportingDriverUtility.h"
#include "platform/linux/driver_stats/LinuxDriverStatsFeed.h"

namespace tal {
namespace {

namespace fs = std::filesystem;

constexpr int kCards = 4;
constexpr int kDevices = 4;  // of a card, each with one substream to play and one to record
constexpr int kProcessors = 8;

class Machine {
 public:
  Machine() {
    std::string name = fs::temp_directory_path() / "tal-bench-XXXXXX";
    if (!::mkdtemp(name.data())) throw std::system_error(errno, std::generic_category(), name);
    root_ = name;
    std::string cards;
    std::string interrupts = "     CPU0 CPU1 CPU2 CPU3 CPU4 CPU5 CPU6 CPU7\n";
    for (int card = 0; card < kCards; ++card) {
      const std::string number = std::to_string(card);
      cards += ' ' + number + " [Card" + number + "          ]: HDA-Intel - HDA Intel PCH\n" +
               "                      HDA Intel PCH at 0x6001118000 irq 14" + number + "\n";
      addCard(number);
      interrupts += " 14" + number + ':';
      for (int i = 0; i < kProcessors; ++i) interrupts += "     123456";
      interrupts += "  IR-PCI-MSI-0000:00:1f.3    0-edge      snd_hda_intel:card" + number + '\n';
    }
    for (int line = 200; line < 280; ++line) {
      interrupts += ' ' + std::to_string(line) + ':';
      for (int i = 0; i < kProcessors; ++i) interrupts += "     123456";
      interrupts += "  IR-PCI-MSI-0000:01:00.0    0-edge      nvme0q" + std::to_string(line) + '\n';
    }
    write("proc/asound/cards", cards);
    write("proc/interrupts", interrupts);
  }
  Machine(const Machine&) = delete;
  Machine& operator=(const Machine&) = delete;
  ~Machine() {
    std::error_code ignored;
    fs::remove_all(root_, ignored);
  }
  const fs::path& root() const { return root_; }

 private:
  void write(const std::string& path, const std::string& text) const {
    fs::create_directories((root_ / path).parent_path());
    std::ofstream(root_ / path) << text;
  }
  void addCard(const std::string& number) const {
    for (int device = 0; device < kDevices; ++device) {
      for (const char direction : {'p', 'c'}) {
        const std::string substream =
            "proc/asound/card" + number + "/pcm" + std::to_string(device) + direction + "/sub0/";
        write(
            substream + "status",
            "state: RUNNING\nowner_pid   : 1734\ntrigger_time: 5121.408273115\ntstamp      : 5131.409101482\n"
            "delay       : 1088\navail       : 15296\navail_max   : 15808\n-----\n"
            "hw_ptr      : 480038\nappl_ptr    : 481126\n");
        write(substream + "hw_params",
              "access: MMAP_INTERLEAVED\nformat: S32_LE\nsubformat: STD\nchannels: 2\n"
              "rate: 48000 (48000/1)\nperiod_size: 1024\nbuffer_size: 16384\n");
      }
    }
    const std::string device = "sys/devices/pci0000:00/0000:00:1f." + number;
    write(device + "/power/runtime_status", "active\n");
    write(device + "/power/runtime_active_time", "5011208\n");
    write(device + "/power/runtime_suspended_time", "120340\n");
    write(device + "/msi_irqs/14" + number, "msi\n");
    const fs::path node = root_ / "sys/class/sound" / ("card" + number);
    fs::create_directories(node);
    fs::create_directory_symlink(root_ / device, node / "device");
  }

  fs::path root_;
};

struct Drivers {
  Machine machine;
  LogChannel log{"talrd", nullptr, LogLevel::kError};
  LinuxDriverStatsFeed feed{{.config_directory = machine.root(), .log = log, .root = machine.root()}};
  TalReportingDriverUtility utility{feed, log};
};

void snapShot(benchmark::State& state) {
  Drivers drivers;
  if (drivers.utility.ioChannelSubscriptions().size() != 4) state.SkipWithError("not all drivers are there");
  for ([[maybe_unused]] auto iteration : state) benchmark::DoNotOptimize(drivers.utility.getSnapShot());
}
BENCHMARK(snapShot)->Name("snapshot of 4 cards, 32 substreams")->Unit(benchmark::kMicrosecond);

// Of the largest group: its reading, and the difference to an earlier one.
void difference(benchmark::State& state) {
  Drivers drivers;
  const auto channels = drivers.feed.copyChannels("Tx", std::nullopt);
  const auto subscribed = drivers.feed.createSubscription(*channels.value);
  const auto before = drivers.feed.createSamples(*subscribed.subscription);
  for ([[maybe_unused]] auto iteration : state) {
    const auto after = drivers.feed.createSamples(*subscribed.subscription);
    const auto delta = drivers.feed.createSamplesDelta(before.value->get(), **after.value);
    if (delta.value->size() != 2 * kCards * kDevices) state.SkipWithError("channels are missing");
  }
}
BENCHMARK(difference)
    ->Name("reading and difference of 16 playback substreams")
    ->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace tal

BENCHMARK_MAIN();
