#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/linux/store/RowQueue.h"

namespace tal {
namespace {

using testing::ElementsAre;

constexpr std::size_t kChunkBytes = 1000;

// A third of a chunk.
StoreRow third(std::string_view payload) {
  static const std::string kFiller(250, 'n');
  return {.table = StoreTable::kEvents, .recorded_at = 1, .number = 0, .name = kFiller, .payload = payload};
}

class RowQueueTest : public testing::Test {
 protected:
  // Two chunks, so six rows.
  RowQueue queue_{{.most_bytes = 2 * kChunkBytes, .chunk_bytes = kChunkBytes}};

  void appendRows(int count) {
    for (int i = 0; i < count; ++i) queue_.append(third(""));
  }
  static std::vector<RowRange> rangesOf(const std::vector<RowChunk>& chunks) {
    std::vector<RowRange> ranges;
    for (const RowChunk& chunk : chunks) ranges.push_back(chunk.range());
    return ranges;
  }
};

TEST_F(RowQueueTest, RowsComeOutAsTheyWentIn) {
  EXPECT_EQ(
      queue_.append(
          {.table = StoreTable::kMetrics, .recorded_at = 1.5, .number = -3, .name = {}, .payload = "b\0b"}),
      1U);
  EXPECT_EQ(
      queue_.append(
          {.table = StoreTable::kEnergylog, .recorded_at = 2.5, .number = 7, .name = "n", .payload = {}}),
      2U);
  std::vector<std::string> seen;
  for (const RowChunk& chunk : queue_.take(kChunkBytes)) {
    chunk.forEach([&](const StoreRow& row) {
      seen.push_back(std::to_string(static_cast<int>(row.table)) + ' ' + std::to_string(row.recorded_at) +
                     ' ' + std::to_string(row.number) + ' ' + std::string(row.name) + '/' +
                     std::string(row.payload));
    });
  }
  EXPECT_THAT(seen, ElementsAre("1 1.500000 -3 /b", "2 2.500000 7 n/"));
}

TEST_F(RowQueueTest, SettledIsWhatIsFinishedAndEverythingBefore) {
  EXPECT_EQ(queue_.settledThrough(), 0U);
  appendRows(4);
  EXPECT_EQ(queue_.settledThrough(), 0U);
  std::vector<RowChunk> taken = queue_.take(kChunkBytes);
  EXPECT_THAT(rangesOf(taken), ElementsAre(RowRange{1, 3}));
  EXPECT_EQ(queue_.settledThrough(), 0U);
  queue_.putBack(std::move(taken));
  EXPECT_EQ(queue_.settledThrough(), 0U);
  queue_.finish(queue_.take(kChunkBytes));
  EXPECT_EQ(queue_.settledThrough(), 3U);
  queue_.finish(queue_.take(kChunkBytes));
  EXPECT_EQ(queue_.settledThrough(), 4U);
  EXPECT_EQ(queue_.bytes(), 0U);
  EXPECT_FALSE(queue_.wasGivenUp({1, 4}));
}

TEST_F(RowQueueTest, TakesOneChunkEvenIfItIsTooMuchAndNeverMoreThanAsked) {
  appendRows(6);
  EXPECT_THAT(rangesOf(queue_.take(1)), ElementsAre(RowRange{1, 3}));
  queue_.finish({});
  appendRows(0);
  EXPECT_THAT(rangesOf(queue_.take(2 * kChunkBytes)), ElementsAre(RowRange{4, 6}));
}

TEST_F(RowQueueTest, GivesUpTheOldestPastTheBound) {
  appendRows(6);
  EXPECT_EQ(queue_.givenUpCount(), 0U);
  appendRows(1);
  EXPECT_EQ(queue_.givenUpCount(), 3U);
  EXPECT_EQ(queue_.settledThrough(), 3U);
  EXPECT_LE(queue_.bytes(), 2 * kChunkBytes);
  EXPECT_TRUE(queue_.wasGivenUp({3, 4}));
  EXPECT_FALSE(queue_.wasGivenUp({4, 7}));
  EXPECT_THAT(rangesOf(queue_.take(5 * kChunkBytes)), ElementsAre(RowRange{4, 6}, RowRange{7, 7}));
}

TEST_F(RowQueueTest, RowsThatAreBeingWrittenAreNotGivenUp) {
  appendRows(6);
  std::vector<RowChunk> taken = queue_.take(kChunkBytes);
  appendRows(3);  // at the bound: 4 to 6 make room
  EXPECT_TRUE(queue_.wasGivenUp({4, 6}));
  EXPECT_EQ(queue_.settledThrough(), 0U);
  queue_.putBack(std::move(taken));
  EXPECT_THAT(rangesOf(queue_.take(5 * kChunkBytes)), ElementsAre(RowRange{1, 3}, RowRange{7, 9}));
  queue_.finish({});
  EXPECT_EQ(queue_.settledThrough(), 9U);
}

TEST_F(RowQueueTest, ARowLargerThanAChunkHasItsOwnAndOneLargerThanTheBoundIsGivenUp) {
  const std::string large(kChunkBytes, 'x');
  const std::string too_large(2 * kChunkBytes, 'x');
  appendRows(1);
  EXPECT_EQ(queue_.append(third(too_large)), 2U);
  EXPECT_TRUE(queue_.wasGivenUp({2, 2}));
  appendRows(1);
  EXPECT_THAT(rangesOf(queue_.take(5 * kChunkBytes)), ElementsAre(RowRange{1, 1}, RowRange{3, 3}));
  queue_.finish({});
  RowQueue roomy({.most_bytes = 10 * kChunkBytes, .chunk_bytes = kChunkBytes});
  roomy.append(third(""));
  roomy.append(third(large));
  roomy.append(third(""));
  EXPECT_EQ(roomy.take(10 * kChunkBytes).size(), 3U);
  EXPECT_EQ(roomy.givenUpCount(), 0U);
}

TEST_F(RowQueueTest, RemembersManyOutagesWithoutForgettingARow) {
  const std::string too_large(2 * kChunkBytes, 'x');
  for (int i = 0; i < 500; ++i) {
    queue_.append(third(too_large));
    queue_.append(third(""));
    queue_.finish(queue_.take(kChunkBytes));
  }
  for (std::uint64_t row = 1; row < 1000; row += 2) ASSERT_TRUE(queue_.wasGivenUp({row, row})) << row;
  EXPECT_FALSE(queue_.wasGivenUp({1000, 1000}));
  EXPECT_FALSE(queue_.wasGivenUp({998, 998})) << "recent ranges are exact";
}

}  // namespace
}  // namespace tal
