#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/linux/driver_stats/CounterDelta.h"
#include "platform/linux/driver_stats/CounterReadings.h"
#include "platform/linux/driver_stats/InterruptReading.h"
#include "platform/linux/driver_stats/PcmReading.h"
#include "platform/linux/driver_stats/SoundCards.h"

namespace tal {
namespace {

TEST(CounterDelta, TellsARestartFromAnOverflow) {
  struct Row {
    std::uint64_t before, after, largest, delta;
  };
  constexpr std::uint64_t kMost32 = 0xFFFFFFFF;
  constexpr std::uint64_t kMost64 = 0xFFFFFFFFFFFFFFFF;
  const std::vector<Row> rows{{5, 5, kMost32, 0},
                              {5, 4'000'000'000, kMost32, 3'999'999'995},
                              {kMost32, 0, kMost32, 1},
                              {kMost32 - 9, 90, kMost32, 100},
                              {kMost32, kMost32 / 2 - 1, kMost32, kMost32 / 2},
                              {kMost32, kMost32 / 2, kMost32, kMost32 / 2},  // restarted: as far either way
                              {5000, 10, kMost32, 10},
                              {kMost64, 9, kMost64, 10},
                              {1'000'000'000'000, 7, kMost64, 7},
                              {99, 3, 9, 3}};  // was never within its range
  for (const Row& row : rows) {
    EXPECT_EQ(counterDelta(row.before, row.after, row.largest), row.delta) << row.before << " " << row.after;
  }
  EXPECT_EQ(largestOfBits(1), 1U);
  EXPECT_EQ(largestOfBits(64), kMost64);
}

TEST(CounterReadings, TextOfAnotherFormGivesNothing) {
  using Row = std::pair<std::string, bool>;
  for (const auto& [text, good] : std::vector<Row>{{"42\n", true},
                                                   {"# events\n\n 255 \n", true},
                                                   {"256", false},
                                                   {"-1", false},
                                                   {"4 2", false},
                                                   {"4\n2", false},
                                                   {"0x10", false},
                                                   {"", false}}) {
    EXPECT_EQ(parseSimple(text, 8).has_value(), good) << text;
  }
  for (const auto& [text, good] : std::vector<Row>{{"on 1 255\noff\t0 0", true},
                                                   {"on 1 256", false},
                                                   {"on 1", false},
                                                   {"on 1 2 3", false},
                                                   {"on one 2", false},
                                                   {"# nothing\n", false}}) {
    EXPECT_EQ(parseStates(text, 8).has_value(), good) << text;
  }
  for (const auto& [text, good] : std::vector<Row>{{"-5 -1 0\n0 9 255\nmin -3\nmax 8", true},
                                                   {"0 9 256", false},
                                                   {"0 9 -1", false},
                                                   {"low 9 1", false},
                                                   {"min 1\nmax 2", false},
                                                   {"0 9 1\nmin", false},
                                                   {"0 9 1\nmin x", false},
                                                   {"0 9 1\nmean 4", false}}) {
    EXPECT_EQ(parseHistogram(text, 8).has_value(), good) << text;
  }
  std::string lines;
  for (int i = 0; i < 1024; ++i) lines += "s" + std::to_string(i) + " 1 1\n";
  EXPECT_TRUE(parseStates(lines, 8).has_value());
  EXPECT_FALSE(parseStates(lines + "one 2 3\n", 8).has_value());
}

std::string statesBetween(const std::string& before, const std::string& after) {
  DriverStatsChannel channel;
  fillDelta(*parseStates(before, 16), *parseStates(after, 16), channel);
  std::string text;
  for (const auto& state : channel.states) {
    text += state.name + ' ' + std::to_string(state.in_transition_count) + ' ' +
            std::to_string(state.residency) + ' ' + std::to_string(state.duty_cycle).substr(0, 4) + "; ";
  }
  return text;
}

TEST(CounterReadings, StatesAreComparedByName) {
  EXPECT_EQ(statesBetween("on 3 1000\noff 2 500", "off 4 800\non 5 1100"), "off 2 300 0.75; on 2 100 0.25; ");
  EXPECT_EQ(statesBetween("on 3 1000", "on 3 1000"), "on 0 0 0.00; ");
  EXPECT_EQ(statesBetween("on 3 1000", "on 3 1000\nnew 1 7"), "on 0 0 0.00; new 1 7 1.00; ");
  EXPECT_EQ(statesBetween("on 3 65530", "on 4 4"), "on 1 10 1.00; ") << "overflown";
  EXPECT_EQ(statesBetween("on 3 1000\noff 2 50", "on 1 30\noff 2 90"), "on 1 30 0.25; off 2 90 0.75; ")
      << "set back, all of them";
}

std::string hitsBetween(const std::string& before, const std::string& after) {
  DriverStatsChannel channel;
  fillDelta(*parseHistogram(before, 16), *parseHistogram(after, 16), channel);
  std::string text = std::to_string(channel.minimum) + ".." + std::to_string(channel.maximum) + ':';
  for (const auto& bucket : channel.buckets) text += ' ' + std::to_string(bucket.hits);
  return text;
}

TEST(CounterReadings, HistogramsAreComparedBucketByBucket) {
  EXPECT_EQ(hitsBetween("0 9 5\n10 19 5\n20 29 5", "0 9 5\n10 19 7\n20 29 6"), "10..29: 0 2 1");
  EXPECT_EQ(hitsBetween("0 9 5\nmin 1\nmax 8", "0 9 6\nmin 0\nmax 9"), "0..9: 1");
  EXPECT_EQ(hitsBetween("-9 -5 5", "-9 -5 6\n-4 0 2"), "-9..0: 1 2") << "a bucket that is new";
  EXPECT_EQ(hitsBetween("0 9 65535\n10 19 3", "0 9 1\n10 19 3"), "0..9: 2 0") << "overflown";
  EXPECT_EQ(hitsBetween("0 9 500\n10 19 3", "0 9 1\n10 19 4"), "0..19: 1 4") << "set back";
}

TEST(SoundCards, AreReadAsTheKernelListsThem) {
  EXPECT_TRUE(parseSoundCards("--- no soundcards ---\n").empty());
  EXPECT_EQ(parseSoundCards(" 0 [PCH            ]: HDA-Intel - HDA Intel PCH\n"
                            "                      HDA Intel PCH at 0x6001118000 irq 145\n"
                            "12 [Device_1       ]: USB-Audio - A [b]: c - d\n"
                            "                      long\n"
                            " 3 [broken\n"),
            (std::vector<SoundCard>{{0, "PCH", "HDA-Intel"}, {12, "Device_1", "USB-Audio"}}));
}

TEST(InterruptReading, CountsByProcessorHoweverTheyComeAndGo) {
  const auto reading = [](const std::string& text) {
    InterruptReading counts;
    for (const auto& line : parseInterrupts(text)) {
      for (const auto& [processor, count] : line.counts) counts.counts[{line.number, processor}] = count;
    }
    return counts;
  };
  const auto before = reading("     CPU0  CPU1\n 9: 100 4294967290 chip 0-edge snd\nNMI: 4 4\n");
  struct Row {
    std::string after;
    std::optional<std::uint64_t> interrupts;
  };
  for (const auto& [after, interrupts] :
       std::vector<Row>{{"CPU0 CPU1\n 9: 101 4294967295 chip 0-edge snd\nNMI: 9 9\n", 6},
                        {"CPU0 CPU1\n 9: 100 4 chip 0-edge snd\n", 10},         // overflown
                        {"CPU0 CPU1\n 9: 3 4294967290 chip 0-edge snd\n", 3},   // set back
                        {"CPU1 CPU2\n 9: 4294967291 50 chip 0-edge snd\n", 1},  // one left, one is new
                        {"CPU0 CPU1\n10: 5 5 chip 0-edge snd\n", std::nullopt},
                        {"", std::nullopt}}) {
    EXPECT_EQ(interruptsBetween(before, reading(after)), interrupts) << after;
  }
}

TEST(InterruptReading, LineOfSeveralHandlersIsShared) {
  const std::string text =
      "   CPU0\n"
      " 16:  7  IR-IO-APIC   16-fasteoi   i801_smbus, snd_ens1371:card0\n"
      " 33:  7  GICv3 112 Level     fe5e0000.i2s\n"
      " 34:  7  GICv3 113 Edge\n";
  const auto lines = parseInterrupts(text);
  ASSERT_EQ(lines.size(), 3U);
  EXPECT_TRUE(lines[0].isShared());
  EXPECT_EQ(lines[0].handlers, "i801_smbus, snd_ens1371:card0");
  EXPECT_FALSE(lines[1].isShared());
  EXPECT_TRUE(lines[1].handlers.ends_with("fe5e0000.i2s"));
}

/// A substream at 48 kHz with a buffer of 4800 frames, read at the given second.
PcmReading running(std::int64_t owner, std::int64_t triggered, std::int64_t read, std::uint64_t pointer,
                   unsigned long_bits = 64) {
  constexpr std::int64_t kSecond = 1'000'000'000;
  return {.status = PcmStatus{.owner_pid = owner,
                              .trigger_nanoseconds = triggered * kSecond,
                              .read_nanoseconds = read * kSecond,
                              .hardware_pointer = pointer,
                              .rate = 48'000,
                              .buffer_size = 4800},
          .kernel_long_bits = long_bits};
}

TEST(PcmReading, FramesMovedAreThoseOfTheSameRunOrOfTheLast) {
  const PcmReading closed;
  const std::uint64_t boundary = pcmBoundary(4800, 32);
  EXPECT_EQ(boundary, 4800U << 18);
  EXPECT_EQ(pcmBoundary(1'073'741'823, 32), 1'073'741'823U) << "twice as much and a buffer is no long";
  struct Row {
    const char* what;
    PcmReading before;
    PcmReading after;
    std::uint64_t frames;
  };
  for (const Row& row : std::vector<Row>{
           {"runs on", running(9, 10, 20, 480'000), running(9, 10, 30, 960'000), 480'000},
           {"stands", running(9, 10, 20, 480'000), running(9, 10, 30, 480'000), 0},
           {"opened since", closed, running(9, 21, 30, 432'000), 432'000},
           {"closed since", running(9, 10, 20, 480'000), closed, 0},
           {"started anew, less far", running(9, 10, 20, 480'000), running(9, 25, 30, 240'000), 240'000},
           {"started anew, farther", running(9, 10, 20, 480'000), running(9, 21, 60, 1'872'000), 1'872'000},
           {"paused for a while", running(9, 10, 110, 4'800'000), running(9, 120, 121, 4'848'000), 48'000},
           {"another owner's", running(9, 10, 20, 480'000), running(8, 10, 30, 960'000), 960'000},
           {"stopped in its run", running(9, 10, 20, 480'000), running(9, 29, 29, 912'000), 432'000},
           {"overflown", running(9, 10, 20, boundary - 1000, 32), running(9, 10, 30, 479'000, 32), 480'000},
           {"set back, long is 32 bits", running(9, 10, 20, 480'000, 32), running(9, 10, 30, 5, 32), 5},
       }) {
    EXPECT_EQ(pcmFramesMoved(&row.before, row.after), row.frames) << row.what;
  }
  EXPECT_EQ(pcmFramesMoved(nullptr, running(9, 10, 20, 77)), 77U);
}

TEST(PeakHistory, AnswersForEachStretchThoughItKeepsNotAll) {
  PeakHistory history;
  EXPECT_EQ(history.largest(0, 100), 0U);
  history.add(1, 50);
  history.add(2, 90);
  history.add(3, 20);
  EXPECT_EQ(history.largest(0, 3), 90U);
  EXPECT_EQ(history.largest(1, 2), 90U);
  EXPECT_EQ(history.largest(2, 3), 20U);
  EXPECT_EQ(history.largest(0, 1), 50U);
  for (std::uint64_t number = 4; number < 1000; ++number) history.add(number, 10);
  EXPECT_EQ(history.largest(0, 999), 90U);
  EXPECT_EQ(history.largest(990, 999), 10U);
}

}  // namespace
}  // namespace tal
