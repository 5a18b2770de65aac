#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <string>

#include "platform/linux/ipc/ReplyChannel.h"

namespace tal {
namespace {

// A channel into a socket whose other end reads only when told to.
class ReplyChannelTest : public testing::Test {
 protected:
  ~ReplyChannelTest() override {
    ::close(ends_[0]);
    if (ends_[1] >= 0) ::close(ends_[1]);
  }

  bool send(std::size_t bytes) {
    std::string replies;
    for (std::size_t i = 0; i < bytes; ++i) replies += static_cast<char>(sent_++ % 251);
    const bool room = channel_.send(replies);
    EXPECT_TRUE(replies.empty());
    return room;
  }

  // Reads what is there; checks that it goes on where the last read ended.
  void readAll() {
    char buffer[8192];
    for (ssize_t count; (count = ::recv(ends_[1], buffer, sizeof buffer, MSG_DONTWAIT)) > 0;) {
      for (ssize_t i = 0; i < count; ++i) {
        ASSERT_EQ(static_cast<unsigned char>(buffer[i]), read_++ % 251) << "at byte " << read_;
      }
    }
  }
  void fill() {
    while (send(10'000)) {
    }
  }

  static std::array<int, 2> connectedPair() {
    std::array<int, 2> ends{-1, -1};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, ends.data()), 0);
    return ends;
  }

  std::array<int, 2> ends_ = connectedPair();
  int flushes_wanted_ = 0;
  int rooms_told_ = 0;
  ReplyChannel channel_{
      ends_[0], {.needs_flush = [this] { ++flushes_wanted_; }, .has_room = [this] { ++rooms_told_; }}};
  std::size_t sent_ = 0;
  std::size_t read_ = 0;
};

TEST_F(ReplyChannelTest, SendsAtOnceWhatTheSocketTakes) {
  EXPECT_TRUE(send(100));
  EXPECT_TRUE(channel_.isEmpty());
  readAll();
  EXPECT_EQ(read_, 100U);
  EXPECT_EQ(flushes_wanted_, 0);
}

TEST_F(ReplyChannelTest, KeepsTheRestInOrderAndTellsWhenThereIsRoomAgain) {
  fill();
  EXPECT_EQ(flushes_wanted_, 1);
  EXPECT_LT(sent_, ReplyChannel::kMostUnsentBytes + 1'000'000);
  EXPECT_EQ(rooms_told_, 0);
  while (!channel_.flush()) readAll();
  readAll();
  EXPECT_EQ(rooms_told_, 1);
  EXPECT_EQ(read_, sent_);
  EXPECT_TRUE(send(1));
}

TEST_F(ReplyChannelTest, DropsWholeRepliesOnceNobodyWaits) {
  fill();
  const std::size_t kept = sent_;
  channel_.stopWaiting();
  EXPECT_EQ(rooms_told_, 1);
  EXPECT_TRUE(send(5000));
  EXPECT_TRUE(send(5000));
  while (!channel_.flush()) readAll();
  readAll();
  EXPECT_EQ(read_, kept);
}

TEST_F(ReplyChannelTest, DropsEverythingWhenThePeerHasGone) {
  fill();
  ::close(ends_[1]);
  ends_[1] = -1;
  EXPECT_TRUE(channel_.flush());
  EXPECT_EQ(rooms_told_, 1);
  EXPECT_TRUE(send(1'000'000));
  EXPECT_TRUE(channel_.isEmpty());
}

TEST_F(ReplyChannelTest, TouchesNoSocketAfterClose) {
  fill();
  channel_.close();
  EXPECT_EQ(rooms_told_, 1);
  readAll();
  const std::size_t before = read_;
  EXPECT_TRUE(send(1000));
  EXPECT_TRUE(channel_.flush());
  readAll();
  EXPECT_EQ(read_, before);
}

}  // namespace
}  // namespace tal
