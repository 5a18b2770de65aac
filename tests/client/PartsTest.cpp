// The rules that need neither a socket nor a thread.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>

#include "client/Diagnostic.h"
#include "client/FakeDaemon.h"
#include "client/LossReport.h"
#include "client/Reconnection.h"
#include "client/SessionModels.h"
#include "client/SocketPaths.h"
#include "client/SocketStream.h"

namespace tal::clientlib {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::ElementsAre;

TEST(Pauses, DoubleUpToTheLongestAndAreShortenedByChance) {
  Reconnection plan(milliseconds(100), milliseconds(1000));
  EXPECT_EQ(plan.nextPause(0), milliseconds(100));
  EXPECT_EQ(plan.nextPause(0.5), milliseconds(150));
  EXPECT_EQ(plan.nextPause(0), milliseconds(400));
  plan.connectionEnded(milliseconds(999));  // Too short to count as a success.
  EXPECT_EQ(plan.nextPause(0), milliseconds(800));
  EXPECT_EQ(plan.nextPause(0), milliseconds(1000));
  for (int i = 0; i < 100; ++i) EXPECT_EQ(plan.nextPause(1), milliseconds(500));
  plan.connectionEnded(milliseconds(1000));
  EXPECT_EQ(plan.nextPause(0), milliseconds(100));
}

TEST(LossReport, TellsOfEachLossOnce) {
  Counters counters;
  LossReport report;
  const LossReport::TimePoint now{seconds(1000)};
  EXPECT_EQ(report.due(counters), std::nullopt);
  counters.droppedQueueFull = 3;
  counters.droppedClosed = 5;  // Of those nobody will ever be there to tell.
  EXPECT_LE(*report.due(counters), now);
  EXPECT_EQ(report.begin(counters, now).all(), 3U);
  counters.refused = 2;
  EXPECT_EQ(report.due(counters), std::nullopt);  // One at a time.
  report.answered();
  EXPECT_EQ(report.due(counters), now + seconds(10));
  const LossReport::Losses second = report.begin(counters, now + seconds(10));
  EXPECT_EQ(second.refused, 2U);
  EXPECT_EQ(second.queueFull, 0U);
  report.connectionBroke();  // Not answered: told again, at once.
  EXPECT_LE(*report.due(counters), now);
  EXPECT_EQ(report.begin(counters, now).all(), 2U);
}

TEST(SocketPaths, AreTheGivenOneElseTheEnvironmentsElseTheRuntimeDirectories) {
  const std::string system = "/run/talreporting/talreporting.sock";
  unsetenv("TALREPORTING_SOCKET");
  setenv("XDG_RUNTIME_DIR", "/run/user/7", 1);
  EXPECT_THAT(socketPaths(nullptr), ElementsAre("/run/user/7/talreporting/talreporting.sock", system));
  EXPECT_THAT(socketPaths("/given"), ElementsAre("/given"));
  setenv("TALREPORTING_SOCKET", "/named", 1);
  EXPECT_THAT(socketPaths(nullptr), ElementsAre("/named"));
  EXPECT_THAT(socketPaths("/given"), ElementsAre("/given"));
  setenv("TALREPORTING_SOCKET", "", 1);
  unsetenv("XDG_RUNTIME_DIR");
  EXPECT_THAT(socketPaths(nullptr), ElementsAre(system));
}

TEST(SocketStream, EndsWithoutASignalWhenThePeerIsGone) {
  test::FakeDaemon daemon;
  daemon.listen();
  SocketStream stream;
  ASSERT_EQ(stream.open(daemon.path()), 0);
  daemon.accept()->close();
  *stream.reserve(1) = 1;
  stream.commit(1);
  EXPECT_EQ(stream.send(), SocketStream::Io::Ended);
  EXPECT_EQ(stream.error(), EPIPE);
  EXPECT_EQ(stream.receive(), SocketStream::Io::Ended);
  EXPECT_EQ(stream.error(), 0);
  EXPECT_EQ(stream.open("/" + std::string(200, 'x')), ENAMETOOLONG);
}

TEST(Outbox, LetsNothingOvertakeAnEndThatWaitsForRoom) {
  Outbox outbox(65536, 1048576, true);
  const RecordParts create{TAL_CREATE_SESSION, {7, 0}, {}};
  while (outbox.request({&create, 1}) == TAL_OK) {
  }
  EXPECT_EQ(outbox.destroySession(7), TAL_OK);
  EXPECT_TRUE(outbox.hasDeferred());
  for (int i = 0; i < 3; ++i) {
    RecordRing::Record oldest;
    ASSERT_TRUE(outbox.ring.peek(outbox.ring.released(), oldest));
    outbox.ring.release(oldest);
  }
  EXPECT_EQ(outbox.request({&create, 1}), TAL_QUEUE_FULL);
  outbox.queueDeferred();
  EXPECT_FALSE(outbox.hasDeferred());
  EXPECT_EQ(outbox.request({&create, 1}), TAL_OK);
}

std::vector<std::string> setUpOf(const SessionModels& models) {
  std::vector<std::string> requests;
  models.setUp([&](tal_operation operation, std::int64_t, std::span<const unsigned char> arguments) {
    // An array around the arguments makes one item of them.
    std::vector<unsigned char> array(arguments.size() + 2, 0x9F);
    std::copy(arguments.begin(), arguments.end(), array.begin() + 1);
    array.back() = 0xFF;
    requests.push_back(std::to_string(operation) + test::diagnostic(array));
  });
  return requests;
}

/// The arguments of a configuration of session 7; `map` is CBOR.
std::vector<unsigned char> configuration(const std::string& map) {
  std::vector<unsigned char> bytes(map.begin(), map.end());
  bytes.push_back(7);
  return bytes;
}

TEST(SessionModels, MergeConfigurationsAsTheDaemonDoes) {
  SessionModels models;
  const std::string alias = test::cborText("RvHostApplicationDisplayID");
  const std::string plain = test::cborText("HostApplicationDisplayID");
  const auto text = [](const char* value) { return test::cborText(value); };
  const auto configure = [&](const std::string& map) {
    models.apply(TAL_SET_CONFIGURATION, 7, 0, configuration(map));
  };
  configure("\xA1" + text("z") + "\x01");  // There is no such session yet.
  models.apply(TAL_CREATE_SESSION, 7, 0, {});
  configure("\xA2" + plain + text("h") + text("z") + "\x9F\x01\xBF" + text("k") + "\x02\xFF\xFF");
  configure("\xF6");
  EXPECT_THAT(setUpOf(models),
              ElementsAre("1[7]", R"(4[{"HostApplicationDisplayID": "h", "z": [1, {"k": 2}]}, 7])"));
  configure("\xA2" + alias + text("r") + text("z") + "\xC1\x02");
  EXPECT_EQ(setUpOf(models)[1],
            R"(4[{"HostApplicationDisplayID": "r", "RvHostApplicationDisplayID": "r", "z": 1(2)}, 7])");
  configure("\xA2" + plain + text("p") + alias + text("q"));
  EXPECT_EQ(setUpOf(models)[1],
            R"(4[{"HostApplicationDisplayID": "p", "RvHostApplicationDisplayID": "q", "z": 1(2)}, 7])");
  models.apply(TAL_CREATE_SESSION, 7, 0, {});  // Replaces it.
  EXPECT_THAT(setUpOf(models), ElementsAre("1[7]"));
}

TEST(SessionModels, KnowTheOldestStartedSession) {
  SessionModels models;
  EXPECT_EQ(models.firstStarted(), std::nullopt);
  for (const std::int64_t reporter : {9, 3, 5}) models.apply(TAL_CREATE_SESSION, reporter, 0, {});
  models.apply(TAL_START_SESSION, 3, 0, {});
  models.apply(TAL_START_SESSION, 5, 0, {});
  EXPECT_EQ(models.firstStarted(), 3);
  models.apply(TAL_STOP_SESSION, 3, 0, {});
  EXPECT_EQ(models.firstStarted(), 5);
  models.apply(TAL_START_SESSION, 9, 0, {});
  EXPECT_EQ(models.firstStarted(), 9);
  models.apply(TAL_SET_SERVICE_TYPE, 9, 4, {});
  EXPECT_EQ(models.firstStarted(), 5);
}

}  // namespace
}  // namespace tal::clientlib
