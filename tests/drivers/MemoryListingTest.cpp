#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "drivers/MemoryListing.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

const std::string kZeros = "wired_mem          0           0           0        none";

TEST(MemoryListing, KeepsTheLinesThatTellOfAResourceInUse) {
  const std::vector<std::pair<std::string, bool>> rows{
      {"RESOURCE player (12)", true},
      {"  cpu_time 1", true},
      {"  phys_mem 1", true},
      {"  wired_mem 1", true},
      {"  phys_footprint 1", true},
      {"cpu_time 1", false},     // no blank before
      {"  cpu_time\t1", false},  // none behind
      {"  phys_footprints 1", false},
      {"  resource", false},
      {"", false},
      {"   " + kZeros, false},
      {"   " + kZeros + " and more", false},
      {kZeros, false},
      {"RESOURCE  " + kZeros, false},           // " wired_mem " is found before RESOURCE
      {"  cpu_time 1 " + kZeros, true},         // " cpu_time " is found first
      {"  phys_footprint 1 " + kZeros, false},  // " wired_mem " is
      {"  wired_mem          0           0           1        none", true}};
  for (const auto& [line, kept] : rows) {
    EXPECT_EQ(isProcessResourceLine(line + '\n'), kept) << line;
  }
}

std::string listed(MemoryListing::Filter filter, const std::vector<std::string>& pieces) {
  MemoryListing listing(filter);
  for (const auto& piece : pieces) listing.add(piece);
  return listing.finish();
}

TEST(MemoryListing, MarksEachLineHoweverTheOutputComes) {
  using enum MemoryListing::Filter;
  EXPECT_EQ(listed(kEveryLine, {"on", "e\n\ntw", "o\nthree"}),
            "wiredlog: one\nwiredlog: \nwiredlog: two\nwiredlog: three");
  EXPECT_EQ(listed(kProcessResources, {"RESO", "URCE a\nnothing\n   cpu_", "time 1\n"}),
            "wiredlog: RESOURCE a\nwiredlog:    cpu_time 1\n");
  EXPECT_EQ(listed(kEveryLine, {}), "");
  EXPECT_EQ(listed(kEveryLine, {""}), "");
}

TEST(MemoryListing, ALongLineIsSeveral) {
  using enum MemoryListing::Filter;
  const std::string longest(2046, 'x');
  EXPECT_EQ(listed(kEveryLine, {longest + "\ny\n"}), "wiredlog: " + longest + "\nwiredlog: y\n");
  EXPECT_EQ(listed(kEveryLine, {longest + "x\ny\n"}), "wiredlog: " + longest + "xwiredlog: \nwiredlog: y\n");
  EXPECT_EQ(listed(kEveryLine, {longest + "xyz\n"}), "wiredlog: " + longest + "xwiredlog: yz\n");
  EXPECT_EQ(listed(kProcessResources, {longest + "x cpu_time 1\n"}), "wiredlog:  cpu_time 1\n")
      << "each piece is filtered by itself";
}

std::vector<std::size_t> blockSizes(const std::string& text) {
  std::vector<std::size_t> sizes;
  std::string together;
  forEachLogBlock(text, [&](std::size_t number, std::string_view block) {
    sizes.push_back(block.size());
    EXPECT_EQ(number, sizes.size());
    together += block;
  });
  EXPECT_EQ(together, text);
  return sizes;
}

TEST(LogBlocks, EndWithTheFirstLineThatEndsBehind512Characters) {
  const auto textOf = [](std::size_t size, const std::vector<std::size_t>& line_ends) {
    std::string text(size, 'x');
    for (const std::size_t at : line_ends) text[at] = '\n';
    return text;
  };
  EXPECT_THAT(blockSizes(""), IsEmpty());
  EXPECT_THAT(blockSizes(textOf(511, {510})), ElementsAre(511));
  EXPECT_THAT(blockSizes(textOf(512, {})), ElementsAre(512));
  EXPECT_THAT(blockSizes(textOf(1300, {100, 900})), ElementsAre(901, 399));
  EXPECT_THAT(blockSizes(textOf(1300, {511})), ElementsAre(512, 512, 276));
  EXPECT_THAT(blockSizes(textOf(1300, {512})), ElementsAre(513, 512, 275));
  EXPECT_THAT(blockSizes(textOf(1024, {})), ElementsAre(512, 512));
  EXPECT_THAT(blockSizes(textOf(1500, {600, 1499})), ElementsAre(601, 899));
}

}  // namespace
}  // namespace tal
