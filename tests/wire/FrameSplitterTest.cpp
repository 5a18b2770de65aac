#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "wire/FrameSplitter.h"
#include "wire/Hex.h"

namespace tal {
namespace {

using testing::ElementsAre;
using Status = FrameSplitter::Status;

// Feeds the chunks; returns the frames, and "bad" where the stream broke.
std::vector<std::string> split(FrameSplitter& splitter, const std::vector<std::string>& chunks) {
  std::vector<std::string> frames;
  for (const std::string& chunk : chunks) {
    splitter.feed(chunk);
    for (;;) {
      const FrameSplitter::Result result = splitter.next();
      if (result.status == Status::kNeedsMore) break;
      if (result.status == Status::kBadLength) {
        frames.emplace_back("bad");
        return frames;
      }
      frames.emplace_back(result.content);
    }
  }
  return frames;
}

TEST(FrameSplitter, FindsTheSameFramesWhereverTheStreamIsCut) {
  const std::string stream = hex("01000000 'a' 03000000 'bcd' 02000000 'ef' 01000000 'g'");
  for (std::size_t first = 0; first <= stream.size(); ++first) {
    for (std::size_t second = first; second <= stream.size(); ++second) {
      FrameSplitter splitter;
      const auto frames = split(
          splitter, {stream.substr(0, first), stream.substr(first, second - first), stream.substr(second)});
      EXPECT_THAT(frames, ElementsAre("a", "bcd", "ef", "g")) << first << ", " << second;
      EXPECT_FALSE(splitter.isMidFrame());
    }
  }
}

TEST(FrameSplitter, TellsAnEndWithinAFrame) {
  for (const char* beginning : {"01", "01000000", "03000000 'ab'", "01000000 'a' 05"}) {
    FrameSplitter splitter;
    split(splitter, {hex(beginning)});
    EXPECT_TRUE(splitter.isMidFrame()) << beginning;
  }
}

TEST(FrameSplitter, RefusesLengthsOutsideTheLimitHoweverTheyArrive) {
  constexpr std::uint32_t kLimit = 4;
  const struct {
    const char* name;
    const char* stream;
    std::vector<std::string> frames;
  } rows[] = {
      {"zero", "01000000 'a' 00000000", {"a", "bad"}},
      {"at the limit", "04000000 'abcd'", {"abcd"}},
      {"over the limit", "05000000 'abcde'", {"bad"}},
      {"huge, nothing behind it", "FFFFFFFF", {"bad"}},
  };
  for (const auto& row : rows) {
    const std::string stream = hex(row.stream);
    for (std::size_t cut = 0; cut <= stream.size(); ++cut) {
      FrameSplitter splitter(kLimit);
      EXPECT_EQ(split(splitter, {stream.substr(0, cut), stream.substr(cut)}), row.frames)
          << row.name << " cut at " << cut;
    }
  }
}

}  // namespace
}  // namespace tal
