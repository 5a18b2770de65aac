// Replies that wait for the store.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/ipc/IpcHost.h"
#include "wire/Hex.h"

namespace tal {
namespace {

using test::message;
using test::Null;
using test::request;
using test::startSession;
using test::success;
using testing::HasSubstr;

class IpcDurability : public testing::Test {
 protected:
  IpcDurability() { host_.start(); }

  // A client with the sessions 7 and 8; each makes one row of a message.
  std::unique_ptr<test::WireClient> durableClient() {
    auto client = host_.connect();
    client->ask(Operation::kHello, 1, 1, MessageDict{{"acknowledge", "durable"}});
    startSession(*client, 7);
    startSession(*client, 8);
    client->ask(Operation::kGetAllReporters, 1);
    return client;
  }
  // The number of the row of the next message.
  std::uint64_t nextRow() { return host_.gate.lastRow() + 1; }

  test::IpcHost host_;
};

TEST_F(IpcDurability, RepliesOnlyOnceTheRowsAreSettled) {
  const auto client = durableClient();
  const std::uint64_t first = nextRow();
  client->send(message(11, 1, {7}) + message(12, 2, {7}) + message(13, 3, {7, 8}));
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 2), success(2, std::vector<int>{7, 8}))
      << "others overtake";
  EXPECT_GT(host_.gate.commits_asked, 0);

  host_.gate.settle(first);
  EXPECT_EQ(client->receive(), success(11, Null{}));
  host_.gate.settle(first + 2);  // the first of the two rows of the third
  EXPECT_EQ(client->receive(), success(12, Null{}));
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 3), success(3, std::vector<int>{7, 8}))
      << "one row is missing";
  host_.gate.settle(first + 3);
  EXPECT_EQ(client->receive(), success(13, Null{}));
}

TEST_F(IpcDurability, TellsOfRowsThatWereGivenUp) {
  const auto client = durableClient();
  const std::uint64_t first = nextRow();
  client->send(message(11, 1, {7, 8}) + message(12, 2, {7}));
  client->ask(Operation::kGetAllReporters, 2);
  host_.gate.giveUp(first + 1);
  host_.gate.settle(first + 2);
  EXPECT_THAT(client->receive().value(),
              testing::AllOf(testing::StartsWith(hex("83 0B 01")), HasSubstr(hex("64 'code' 06"))));
  EXPECT_EQ(client->receive(), success(12, Null{}));
}

TEST_F(IpcDurability, WaitsForNothingWhereThereIsNothingToWaitFor) {
  const auto client = durableClient();
  host_.sink.wanted = false;
  EXPECT_EQ(client->ask(Operation::kSendMessage, 1, MessageDict{{"n", 1}}, 4, 1, std::vector<int>{7}),
            success(1, Null{}))
      << "a message without a row";
  host_.sink.wanted = true;
  client->send(message(0, 2, {7}));
  const auto other = host_.connect();
  EXPECT_EQ(other->ask(Operation::kSendMessage, 1, MessageDict{{"n", 3}}, 4, 1, std::vector<int>{7}),
            success(1, Null{}))
      << "a client that did not ask for it";
  EXPECT_EQ(client->ask(Operation::kHello, 3, 1),
            success(3, MessageDict{{"version", 1}, {"server", "test 1"}}));
  EXPECT_EQ(client->ask(Operation::kSendMessage, 4, MessageDict{{"n", 4}}, 4, 1, std::vector<int>{7}),
            success(4, Null{}))
      << "one that no longer asks for it";
}

TEST_F(IpcDurability, AnswersAClientThatOnlyListensAnyMore) {
  const auto client = durableClient();
  const std::uint64_t first = nextRow();
  client->send(message(11, 1, {7}));
  client->endSending();
  while (!host_.log_sink.holds("from the server client list")) host_.numbersCarriedOut();
  host_.gate.settle(first);
  EXPECT_EQ(client->receive(), success(11, Null{}));
  EXPECT_EQ(client->receive(), std::nullopt);
}

TEST_F(IpcDurability, ForgetsRepliesOfAClientThatHasGone) {
  auto client = durableClient();
  const std::uint64_t first = nextRow();
  client->send(message(11, 1, {7}));
  client.reset();
  while (!host_.log_sink.holds("from the server client list")) host_.numbersCarriedOut();
  host_.gate.settle(first);
  const auto other = host_.connect();
  EXPECT_EQ(other->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
}

}  // namespace
}  // namespace tal
