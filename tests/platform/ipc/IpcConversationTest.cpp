// What a client says and what it hears, over a real socket.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/ipc/IpcHost.h"
#include "wire/Hex.h"
#include "wire/ReplyEncoder.h"

namespace tal {
namespace {

using test::frameOf;
using test::message;
using test::Null;
using test::request;
using test::startSession;
using test::success;
using testing::ElementsAreArray;
using testing::HasSubstr;

class IpcConversation : public testing::Test {
 protected:
  IpcConversation() { host_.start(); }
  test::IpcHost host_;
};

std::string error(int call, WireErrorCode code) {
  std::string frame;
  ReplyEncoder(frame).error(static_cast<std::uint64_t>(call), code, "");
  // Without the text, which is the last item and empty here.
  return frame.substr(kFrameHeaderBytes, frame.size() - kFrameHeaderBytes - 1);
}

TEST_F(IpcConversation, AnswersEveryOperation) {
  const auto client = host_.connect();
  EXPECT_EQ(client->ask(Operation::kHello, 1, 1),
            success(1, MessageDict{{"version", 1}, {"server", "test 1"}}));
  EXPECT_EQ(client->ask(Operation::kCreateReportingSession, 2, 7), success(2, true));
  EXPECT_EQ(client->ask(Operation::kSetServiceType, 3, 9, 7), success(3, true));
  EXPECT_EQ(client->ask(Operation::kGetServiceNameForReporterID, 4, 7), success(4, 9));
  EXPECT_EQ(client->ask(Operation::kSetConfiguration, 5, Null{}, 7), success(5, true));
  EXPECT_EQ(client->ask(Operation::kSetConfiguration, 6, MessageDict{{"a", 1}}, 7), success(6, true));
  EXPECT_EQ(client->ask(Operation::kValidateReporterID, 8, 7),
            success(8, MessageDict{{"reporterID", 7}, {"serviceType", 9}}));
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 9), success(9, std::vector<int>{7}));
  EXPECT_EQ(client->ask(Operation::kDestroyReportingSession, 10, 7), success(10, true));
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 11), success(11, std::vector<int>{}));
}

TEST_F(IpcConversation, HoldsTheStartReplyUntilTheStop) {
  const auto client = host_.connect();
  client->send(request(Operation::kCreateReportingSession, 0, 7));
  client->send(request(Operation::kStartReportingSessionForID, 1, 7));
  client->send(request(Operation::kStartReportingSessionForID, 2, 7));  // never answered
  EXPECT_EQ(client->ask(Operation::kStopReportingSessionForID, 3, 7), success(1, true));
  EXPECT_EQ(client->receive(), success(3, true));
  EXPECT_EQ(client->ask(Operation::kGetServiceNameForReporterID, 4, 0), success(4, 65535));
  EXPECT_EQ(client->receive(), success(4, 65535)) << "reporter 0 is answered twice";
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 5), success(5, std::vector<int>{7}));
}

TEST_F(IpcConversation, CarriesRequestsOutInTheirOrderHoweverTheyAreCut) {
  constexpr int kMessages = 500;
  for (const std::size_t piece : {1U, 7U, 4096U, 1'000'000U}) {
    const auto client = host_.connect();
    startSession(*client, 7);
    const std::size_t before = host_.numbersCarriedOut().size();
    std::string all;
    std::vector<int> expected;
    for (int i = 1; i <= kMessages; ++i) {
      all += message(i, i, {7});
      expected.push_back(i);
    }
    for (std::size_t at = 0; at < all.size(); at += piece) client->send(all.substr(at, piece));
    for (int i = 1; i <= kMessages; ++i) ASSERT_EQ(client->receive(), success(i, Null{}));
    auto carried_out = host_.numbersCarriedOut();
    carried_out.erase(carried_out.begin(), carried_out.begin() + static_cast<std::ptrdiff_t>(before));
    EXPECT_THAT(carried_out, ElementsAreArray(expected)) << piece;
  }
}

TEST_F(IpcConversation, AnswersBadRequestsInTheirTurnAndGoesOn) {
  const auto client = host_.connect();
  client->send(message(0, 1, {7}) + frameOf(hex("FF")) + frameOf(hex("82 18 63 05")) +
               frameOf(hex("83 01 06 60")) + frameOf(hex("83 00 07 02")) + frameOf(hex("83 01 00 60")) +
               request(Operation::kGetAllReporters, 9));
  EXPECT_THAT(client->receive(),
              testing::Optional(HasSubstr(error(0, WireErrorCode::kBadRequest).substr(0, 38))));
  EXPECT_THAT(client->receive().value(), testing::StartsWith(hex("83 05 01 A3")));
  EXPECT_THAT(client->receive().value(), testing::StartsWith(hex("83 06 01 A3")));
  EXPECT_THAT(client->receive().value(), testing::StartsWith(hex("83 07 01 A3")));
  EXPECT_EQ(client->receive(), success(9, std::vector<int>{}))
      << "call 0 has no reply, and nothing took effect";
}

TEST_F(IpcConversation, EndsTheConnectionAtABadLengthAfterWhatCameBefore) {
  for (const char* bad_length : {"00000000", "FFFFFFFF", "01001000"}) {
    const auto client = host_.connect();
    client->send(request(Operation::kGetAllReporters, 1) + hex(bad_length) +
                 request(Operation::kCreateReportingSession, 2, 7));
    EXPECT_EQ(client->receive(), success(1, std::vector<int>{})) << bad_length;
    EXPECT_THAT(client->receive().value(), HasSubstr(hex("64 'code' 04"))) << bad_length;
    EXPECT_EQ(client->receive(), std::nullopt) << bad_length;
  }
  const auto other = host_.connect();
  EXPECT_EQ(other->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
}

TEST_F(IpcConversation, KeepsClientsApartAndSeesAcrossThem) {
  const auto one = host_.connect();
  const auto two = host_.connect();
  ASSERT_EQ(one->ask(Operation::kCreateReportingSession, 1, 7), success(1, true));
  ASSERT_EQ(one->ask(Operation::kSetServiceType, 2, 9, 7), success(2, true));
  EXPECT_EQ(two->ask(Operation::kGetServiceNameForReporterID, 1, 7), success(1, 9));
  EXPECT_EQ(two->ask(Operation::kDestroyReportingSession, 2, 7), success(2, true)) << "own sessions only";
  EXPECT_EQ(two->ask(Operation::kGetAllReporters, 3), success(3, std::vector<int>{7}));
}

TEST_F(IpcConversation, RefusesMessagesOfOneThatKeepsTooMuch) {
  test::IpcHost small;
  TalReportingService service(small.platform, *small.roster, small.system_monitor,
                              {.end_process = [] {}, .max_kept_bytes = 100'000});
  IpcListener listener(service, small.gate, ListeningSocket(small.socketPath()), "test 1");
  listener.start();
  {
    const auto client = small.connect();
    startSession(*client, 7);
    int call = 1;
    while (client->ask(Operation::kSendMessage, call, MessageDict{{"n", call}}, 4, 1, std::vector<int>{7}) ==
           success(call, Null{})) {
      ++call;
    }
    EXPECT_GT(call, 50);
    EXPECT_LT(call, 2000);
    EXPECT_EQ(client->ask(Operation::kDestroyReportingSession, 1, 7), success(1, true));
    EXPECT_EQ(client->ask(Operation::kSendMessage, 2, MessageDict{{"n", 0}}, 4, 1, std::vector<int>{7}),
              success(2, Null{}));
  }
  listener.stop();
  small.queue.stop();
}

}  // namespace
}  // namespace tal
