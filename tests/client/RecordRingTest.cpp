// The queue: order, bounds, and many producers.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <thread>
#include <vector>

#include "client/RecordRing.h"

namespace tal::clientlib {
namespace {

constexpr std::size_t kBytes = 4096;

RecordParts parts(std::int64_t reporter, const std::string& text) {
  return {TAL_SEND_MESSAGE,
          {reporter, 0},
          {{}, {reinterpret_cast<const unsigned char*>(text.data()), text.size()}, {}}};
}

/// Reads the oldest record and releases it.
bool take(RecordRing& ring, std::int64_t& reporter, std::string& text) {
  RecordRing::Record record;
  if (!ring.peek(ring.released(), record)) return false;
  reporter = ring.head(record).reporter;
  text.resize(record.argumentBytes);
  ring.copyArguments(record, reinterpret_cast<unsigned char*>(text.data()));
  ring.release(record);
  return true;
}

TEST(RecordRing, HandsBackWhatWasPutInAcrossItsEnd) {
  RecordRing ring(kBytes);
  std::int64_t reporter = 0;
  std::string text;
  // Lengths that share no factor with the ring's, so that records end at every place.
  for (int i = 0; i < 1000; ++i) {
    const std::string sent(static_cast<std::size_t>(i * 7 % 1500), static_cast<char>('a' + i % 26));
    ASSERT_TRUE(ring.push(parts(i, sent), 0)) << i;
    ASSERT_TRUE(take(ring, reporter, text)) << i;
    ASSERT_EQ(reporter, i);
    ASSERT_EQ(text, sent) << i;
  }
  EXPECT_FALSE(take(ring, reporter, text));
}

TEST(RecordRing, TakesNoMoreThanItHolds) {
  RecordRing ring(kBytes);
  const std::string text(40, 'x');  // 64 bytes with header and head.
  int pushed = 0;
  while (ring.push(parts(pushed, text), 1024)) ++pushed;
  EXPECT_EQ(pushed, 48);
  while (ring.push(parts(pushed, text), 0)) ++pushed;
  // One less than would fill it: what follows the newest must not look like the oldest.
  EXPECT_EQ(pushed, 63);
  RecordRing::Record record;
  EXPECT_FALSE(ring.peek(ring.reserved(), record));
  std::int64_t reporter = 0;
  std::string out;
  ASSERT_TRUE(take(ring, reporter, out));
  EXPECT_TRUE(ring.push(parts(99, text), 0));
}

TEST(RecordRing, TakesSeveralRecordsWholeOrNotAtAll) {
  RecordRing ring(kBytes);
  const std::string half(2000, 'x');
  const RecordParts three[] = {parts(1, half), parts(2, half), parts(3, half)};
  EXPECT_FALSE(ring.push(three, 0));
  EXPECT_EQ(ring.reserved(), 0U);
  EXPECT_TRUE(ring.push({three, 1}, 0));
}

TEST(RecordRing, MarksStayUntilTheRecordIsReleased) {
  RecordRing ring(kBytes);
  ring.push(parts(1, "a"), 0);
  RecordRing::Record record;
  ASSERT_TRUE(ring.peek(0, record));
  EXPECT_FALSE(record.done);
  ring.markDone(record, true);
  ASSERT_TRUE(ring.peek(0, record));
  EXPECT_TRUE(record.done && record.refused);
  EXPECT_EQ(record.argumentBytes, 1U);
}

TEST(RecordRing, KeepsEachProducersOrder) {
  RecordRing ring(kBytes);
  constexpr std::int64_t kProducers = 3;
  constexpr int kRecords = 20000;
  std::vector<std::thread> producers;
  for (std::int64_t producer = 0; producer < kProducers; ++producer) {
    producers.emplace_back([&ring, producer] {
      for (int i = 0; i < kRecords; ++i) {
        const std::string text = std::to_string(i) + std::string(static_cast<std::size_t>(i % 60), '.');
        while (!ring.push(parts(producer, text), 0)) std::this_thread::yield();
      }
    });
  }
  std::vector<int> next(kProducers, 0);
  std::int64_t reporter = 0;
  std::string text;
  for (int taken = 0; taken < kRecords * kProducers;) {
    if (!take(ring, reporter, text)) {
      std::this_thread::yield();
      continue;
    }
    int& expected = next[static_cast<std::size_t>(reporter)];
    EXPECT_EQ(text, std::to_string(expected) + std::string(static_cast<std::size_t>(expected % 60), '.'));
    ++expected;
    ++taken;
  }
  for (std::thread& producer : producers) producer.join();
}

}  // namespace
}  // namespace tal::clientlib
