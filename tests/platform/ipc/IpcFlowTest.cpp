// Clients that send too fast, read too slowly, or are too many.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "platform/ipc/IpcHost.h"

namespace tal {
namespace {

using test::message;
using test::Null;
using test::request;
using test::startSession;
using test::success;

class IpcFlow : public testing::Test {
 protected:
  // A client with a started session.
  std::unique_ptr<test::WireClient> clientWithSession(int reporter_id) {
    auto client = host_.connect();
    startSession(*client, reporter_id);
    client->ask(Operation::kGetServiceNameForReporterID, 1, reporter_id);
    return client;
  }
  // Messages numbered from `first` on; far more than any bound.
  static std::string messages(int first, int count, int reporter_id) {
    std::string all;
    for (int i = 0; i < count; ++i) all += message(1, first + i, {reporter_id});
    return all;
  }

  test::IpcHost host_;
};

TEST_F(IpcFlow, MakesAFloodWaitAndDropsNothing) {
  host_.start();
  const auto client = clientWithSession(7);
  constexpr int kMessages = 100'000;
  const std::string all = messages(0, kMessages, 7);
  host_.blockQueue();
  const std::size_t sent = client->sendUntilRefused(all);
  EXPECT_LT(sent, std::size_t{2} << 20) << "bounded, however much is sent";
  ASSERT_LT(sent, all.size());
  host_.unblockQueue();

  std::size_t at = sent;
  int replies = 0;
  while (at < all.size()) {  // reads while it sends, as a client must
    at += client->sendUntilRefused(std::string_view(all).substr(at, 20'000));
    for (; replies < kMessages && static_cast<std::size_t>(replies) < at / (all.size() / kMessages) / 2;
         ++replies) {
      ASSERT_EQ(client->receive(), success(1, Null{}));
    }
  }
  for (; replies < kMessages; ++replies) ASSERT_EQ(client->receive(), success(1, Null{}));
  const auto carried_out = host_.numbersCarriedOut();
  ASSERT_EQ(carried_out.size(), static_cast<std::size_t>(kMessages));
  EXPECT_TRUE(std::is_sorted(carried_out.begin(), carried_out.end()));
}

TEST_F(IpcFlow, LetsConnectionsTakeTurns) {
  host_.start();
  const auto flooding = clientWithSession(7);
  const auto modest = clientWithSession(8);
  constexpr int kModest = 1'000'000;
  host_.blockQueue();
  flooding->sendUntilRefused(messages(0, 30'000, 7));
  modest->send(message(1, kModest, {8}));
  host_.letListenerCatchUp();
  host_.unblockQueue();
  EXPECT_EQ(modest->receive(), success(1, Null{}));

  const auto carried_out = host_.numbersCarriedOut();
  const auto found = std::find(carried_out.begin(), carried_out.end(), kModest);
  ASSERT_NE(found, carried_out.end());
  const auto before = static_cast<std::size_t>(found - carried_out.begin());
  EXPECT_LE(before, 4 * RequestRunner::kMostRequestsPerTurn);
}

TEST_F(IpcFlow, DoesNotServeOneWhoDoesNotRead) {
  host_.start();
  const auto slow = host_.connect();
  constexpr int kSessions = 2000;
  std::string sessions;
  for (int i = 1; i <= kSessions; ++i)
    sessions += request(Operation::kCreateReportingSession, 0, 100'000 + i);
  slow->send(sessions);
  // Each reply is some ten kilobytes.
  constexpr int kRequests = 1000;
  constexpr int kMarker = 5;
  std::string requests;
  for (int i = 0; i < kRequests; ++i) requests += request(Operation::kGetAllReporters, 1);
  slow->send(requests + message(0, kMarker, {}));

  // Every turn that the queue had has been taken by now.
  const auto other = host_.connect();
  for (int i = 0; i < kRequests; ++i) other->ask(Operation::kValidateReporterID, 1, 1);
  EXPECT_TRUE(host_.numbersCarriedOut().empty());

  const std::string first = slow->receive().value();
  EXPECT_GT(first.size(), 8000U);
  for (int i = 1; i < kRequests; ++i) ASSERT_EQ(slow->receive(), first);
  slow->ask(Operation::kValidateReporterID, 2, 1);
  EXPECT_THAT(host_.numbersCarriedOut(), testing::ElementsAre(kMarker));
}

TEST_F(IpcFlow, CarriesOutWhatOneSentWhoThenWentWithoutReading) {
  host_.start();
  auto slow = clientWithSession(7);
  std::string requests;
  for (int i = 0; i < 60'000; ++i) requests += request(Operation::kGetServiceNameForReporterID, 1, 7);
  constexpr int kMarker = 5;
  const std::size_t sent = slow->sendUntilRefused(requests + message(0, kMarker, {7}));
  slow.reset();
  while (!host_.log_sink.holds("from the server client list")) host_.numbersCarriedOut();
  EXPECT_EQ(host_.numbersCarriedOut().size(), sent > requests.size() ? 1U : 0U);
  const auto other = host_.connect();
  EXPECT_EQ(other->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
}

TEST_F(IpcFlow, ReadsNothingWhileTheStoreIsBehind) {
  host_.start();
  const auto client = clientWithSession(7);
  host_.gate.setOverBound(true);
  const std::string all = messages(0, 50'000, 7);
  const std::size_t sent = client->sendUntilRefused(all);
  EXPECT_LT(sent, std::size_t{1} << 20);
  EXPECT_LE(host_.numbersCarriedOut().size(), IpcConnection::kReadSliceBytes / 16);
  host_.gate.setOverBound(false);
  EXPECT_EQ(client->receive(), success(1, Null{}));
}

TEST_F(IpcFlow, LetsOnlySoManyIn) {
  host_.setting("max_connections", 2);
  host_.start();
  auto one = host_.connect();
  const auto two = host_.connect();
  one->ask(Operation::kGetAllReporters, 1);
  two->ask(Operation::kGetAllReporters, 1);
  const auto three = host_.connect();
  three->send(request(Operation::kGetAllReporters, 3));
  two->ask(Operation::kGetAllReporters, 2);
  EXPECT_EQ(three->sendUntilRefused(std::string(4 << 20, '\1')) < std::size_t{4 << 20}, true)
      << "nobody reads it";
  one.reset();
  EXPECT_EQ(three->receive(), success(3, std::vector<int>{}));
}

TEST_F(IpcFlow, HoldsFramesToTheLimitOfTheSettings) {
  host_.setting("max_frame_bytes", 3);
  host_.start();
  const auto client = host_.connect();
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
  client->send(request(Operation::kCreateReportingSession, 1, 1));
  EXPECT_THAT(client->receive().value(), testing::HasSubstr("org.vantle.talsys.ipc"));
  EXPECT_EQ(client->receive(), std::nullopt);
}

}  // namespace
}  // namespace tal
