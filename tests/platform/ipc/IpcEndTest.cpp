// How connections end, and how the daemon does; and who may do what.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <string>
#include <thread>

#include "platform/ipc/IpcHost.h"
#include "wire/Hex.h"

namespace tal {
namespace {

using test::message;
using test::Null;
using test::request;
using test::startSession;
using test::success;
using testing::ElementsAre;
using testing::HasSubstr;

class IpcEnd : public testing::Test {
 protected:
  void waitUntilLogged(std::string_view text) {
    while (!host_.log_sink.holds(text)) host_.numbersCarriedOut();
  }
  test::IpcHost host_;
};

// A connection of somebody who is neither root nor this user; null where this
// process may not play that part. The kernel takes the credentials of the
// thread that connects, and a raw system call changes this thread's alone.
std::unique_ptr<test::WireClient> connectAsSomebodyElse(const std::filesystem::path& path) {
  constexpr uid_t kSomebody = 65534;
  std::unique_ptr<test::WireClient> client;
  std::thread([&] {
    if (::syscall(SYS_setresuid, kSomebody, kSomebody, kSomebody) == 0) {
      client = std::make_unique<test::WireClient>(path);
    }
  }).join();
  return client;
}

TEST_F(IpcEnd, CarriesOutEverythingBeforeTheSessionsAreStopped) {
  host_.start();
  auto client = host_.connect();
  startSession(*client, 7);
  client->send(message(1, 1, {7}) + message(2, 2, {7}) + message(3, 3, {7}));
  client.reset();
  waitUntilLogged("from the server client list");
  EXPECT_THAT(host_.numbersCarriedOut(), ElementsAre(1, 2, 3));
  EXPECT_FALSE(host_.log_sink.holds("interruptionHandler"));
}

TEST_F(IpcEnd, TellsOfAPeerThatBrokeOffInAFrame) {
  host_.start();
  auto client = host_.connect();
  client->send(request(Operation::kGetAllReporters, 1) + hex("05000000 82"));
  client.reset();
  waitUntilLogged("invalidationHandler");
  EXPECT_TRUE(host_.log_sink.holds("interruptionHandler"));
}

TEST_F(IpcEnd, AnswersAPeerThatOnlyListensAnyMore) {
  host_.start();
  const auto client = host_.connect();
  client->send(request(Operation::kGetAllReporters, 1) + request(Operation::kGetAllReporters, 2));
  client->endSending();
  EXPECT_EQ(client->receive(), success(1, std::vector<int>{}));
  EXPECT_EQ(client->receive(), success(2, std::vector<int>{}));
  EXPECT_EQ(client->receive(), std::nullopt);
}

TEST_F(IpcEnd, DropsAHeldReplyWithTheConnection) {
  host_.start();
  auto client = host_.connect();
  client->send(request(Operation::kCreateReportingSession, 0, 7) +
               request(Operation::kStartReportingSessionForID, 1, 7));
  client.reset();
  waitUntilLogged("from the server client list");
  const auto other = host_.connect();
  EXPECT_EQ(other->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
}

TEST_F(IpcEnd, DrainsWhatWasReceivedAndStartsNothingNew) {
  host_.start();
  const auto client = host_.connect();
  startSession(*client, 7);
  client->ask(Operation::kGetAllReporters, 1);
  host_.blockQueue();
  client->send(message(1, 1, {7}) + message(2, 2, {7}));
  std::thread drain([this] { host_.listener->drain(); });
  host_.unblockQueue();
  drain.join();
  EXPECT_THAT(host_.numbersCarriedOut(), ElementsAre(1, 2));
  EXPECT_EQ(client->receive(), success(1, Null{}));
  EXPECT_EQ(client->receive(), success(2, Null{}));

  EXPECT_THROW(host_.connect(), std::runtime_error);
  client->send(message(3, 3, {7}));
  host_.listener->stop();
  EXPECT_EQ(client->receive(), std::nullopt) << "closed, and the held start reply never came";
  EXPECT_EQ(host_.numbersCarriedOut().size(), 2U);
}

TEST_F(IpcEnd, DrainsPastAPeerThatDoesNotRead) {
  host_.start();
  const auto slow = host_.connect();
  std::string requests;
  for (int i = 0; i < 40'000; ++i) requests += request(Operation::kValidateReporterID, 1, 1);
  slow->sendUntilRefused(requests);
  host_.listener->drain();
  host_.listener->stop();
}

TEST_F(IpcEnd, SendsDurableRepliesThatCameWithTheLastCommit) {
  host_.start();
  const auto client = host_.connect();
  client->ask(Operation::kHello, 1, 1, MessageDict{{"acknowledge", "durable"}});
  startSession(*client, 7);
  client->send(message(2, 1, {7}));
  client->ask(Operation::kGetAllReporters, 3);
  host_.listener->drain();
  host_.gate.settle(host_.gate.lastRow());
  host_.listener->stop();
  EXPECT_EQ(client->receive(), success(2, Null{}));
  EXPECT_EQ(client->receive(), std::nullopt);
}

TEST_F(IpcEnd, KillTakesEffectAtOnce) {
  host_.start();
  const auto client = host_.connect();
  client->ask(Operation::kGetAllReporters, 1);
  host_.blockQueue();
  client->send(message(1, 1, {}));
  host_.letListenerCatchUp();
  client->send(request(Operation::kKillService, 2));
  host_.killed.get_future().wait();
  host_.unblockQueue();
  EXPECT_TRUE(host_.numbersCarriedOut().empty()) << "what waited is not carried out";
}

TEST_F(IpcEnd, KillIsNotForEverybody) {
  host_.start();
  const auto somebody = connectAsSomebodyElse(host_.socketPath());
  if (!somebody) GTEST_SKIP() << "needs root";
  EXPECT_THAT(somebody->ask(Operation::kKillService, 2),
              testing::AllOf(testing::StartsWith(hex("83 02 01")), HasSubstr(hex("64 'code' 03"))));
  EXPECT_EQ(somebody->ask(Operation::kGetAllReporters, 3), success(3, std::vector<int>{}));
}

TEST_F(IpcEnd, OnlyThoseNamedMayConnect) {
  host_.setting("allowed_users", MessageArray{"nobody-of-this-name"});
  host_.start();
  const auto refused = host_.connect();
  EXPECT_THAT(refused->receive().value(),
              testing::AllOf(testing::StartsWith(hex("83 00 01")), HasSubstr(hex("64 'code' 03"))));
  EXPECT_EQ(refused->receive(), std::nullopt);
}

TEST_F(IpcEnd, ThoseNamedConnect) {
  host_.setting("allowed_groups", MessageArray{static_cast<std::int64_t>(::getegid())});
  host_.start();
  const auto client = host_.connect();
  EXPECT_EQ(client->ask(Operation::kGetAllReporters, 1), success(1, std::vector<int>{}));
}

}  // namespace
}  // namespace tal
