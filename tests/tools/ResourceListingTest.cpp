#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <string>

#include "platform/TemporaryDirectory.h"
#include "tools/talresources/Listing.h"

namespace tal {
namespace {

using ::testing::HasSubstr;

/// A /proc of the test's own.
class ResourceListing : public testing::Test {
 protected:
  void add(int process, const std::string& name, const std::string& state = "S",
           const std::string& flags = "4194304") {
    const auto folder = proc.path() / std::to_string(process);
    // 250 ticks in user code, 50 in the kernel; a tick is 10 ms on every Linux.
    test::writeFile(folder / "stat", std::to_string(process) + " (" + name + ") " + state + " 1 2 3 0 -1 " +
                                         flags + " 5 6 7 8 250 50 0 0 20 0 1 0 99 0 0\n");
    test::writeFile(folder / "status", "Name:\t" + name +
                                           "\nVmHWM:\t  999 kB\nVmLck:\t   3 kB\nVmPin:\t   4 kB\n"
                                           "VmRSS:\t   900 kB\nRssAnon:\t   300 kB\nRssFile:\t   500 kB\n");
    test::writeFile(folder / "smaps_rollup",
                    "00400000-7fff [rollup]\nRss:   900 kB\nPss:   450 kB\n"
                    "Pss_Anon:   300 kB\nPss_File:  150 kB\n");
  }
  std::string listing() {
    std::string text;
    listProcesses(proc.path(), [&text](std::string_view block) { text += block; });
    return text;
  }

  test::TemporaryDirectory proc;
};

TEST_F(ResourceListing, HasABlockOfAlignedColumnsForEachProcess) {
  add(12, "player");
  add(9, "a (b) c\n");
  test::writeFile(proc.path() / "9" / "status", "VmRSS:\t 1 kB\nRssAnon:\t 1 kB\n");
  test::writeFile(proc.path() / "9" / "smaps_rollup", "Pss:   12345678901 kB\n");
  test::writeFile(proc.path() / "version", "no process");
  EXPECT_EQ(listing(),
            "RESOURCE a (b) c? (9)\n"
            "        cpu_time       3000        2500         500          ms\n"
            "        phys_mem          1           1           0         KiB\n"
            "       wired_mem          0           0           0        none\n"
            "  phys_footprint 12345678901           0 12345678901         KiB\n"
            "RESOURCE player (12)\n"
            "        cpu_time       3000        2500         500          ms\n"
            "        phys_mem        900         300         600         KiB\n"
            "       wired_mem          7           3           4         KiB\n"
            "  phys_footprint        450         300         150         KiB\n");
}

TEST_F(ResourceListing, LeavesOutWhatEndedAndWhatIsTheKernels) {
  add(1, "ended early");
  std::filesystem::remove(proc.path() / "1" / "stat");
  add(2, "ended meanwhile");
  std::filesystem::remove(proc.path() / "2" / "status");
  add(3, "ended late");
  std::filesystem::remove(proc.path() / "3" / "smaps_rollup");
  add(4, "kthread", "S", std::to_string(0x00200000));
  add(5, "broken");
  test::writeFile(proc.path() / "5" / "stat", "5 (broken) S 1 2");
  EXPECT_EQ(listing(), "");
  add(6, "zombie", "Z");
  std::filesystem::remove(proc.path() / "6" / "smaps_rollup");
  EXPECT_THAT(listing(), HasSubstr("RESOURCE zombie (6)\n"));
}

TEST_F(ResourceListing, SaysWhereMemoryMayNotBeRead) {
  ProcessResources resources;
  resources.name = "other";
  EXPECT_THAT(processBlock(resources),
              HasSubstr("  phys_footprint          -           -           -      denied\n"));
}

TEST_F(ResourceListing, ReadsTheRealThing) {
  ProcessReader reader("/proc");
  const auto all = reader.processIdentifiers();
  EXPECT_THAT(all, testing::Contains(static_cast<int>(::getpid())));
  const auto own = reader.read(::getpid());
  ASSERT_TRUE(own);
  EXPECT_GT(own->phys_kib.total, own->phys_kib.first);
  ASSERT_TRUE(own->footprint_kib);
  EXPECT_GT(own->footprint_kib->first, 0U);
  EXPECT_LE(own->footprint_kib->total, own->phys_kib.total + own->phys_kib.total / 2);
}

TEST_F(ResourceListing, ZonesAreTheSlabsElseTheMemoryFigures) {
  std::string text;
  const auto write = [&text](std::string_view part) { text += part; };
  EXPECT_THAT(listZones(proc.path(), write).value_or(""),
              HasSubstr("neither slabinfo nor meminfo can be read"));
  test::writeFile(proc.path() / "meminfo", "MemTotal: 1 kB\n");
  EXPECT_EQ(listZones(proc.path(), write), std::nullopt);
  EXPECT_EQ(text, "MemTotal: 1 kB\n");
  test::writeFile(proc.path() / "slabinfo", "kmalloc-8 7\n");
  text.clear();
  EXPECT_EQ(listZones(proc.path(), write), std::nullopt);
  EXPECT_EQ(text, "kmalloc-8 7\n");
}

}  // namespace
}  // namespace tal
