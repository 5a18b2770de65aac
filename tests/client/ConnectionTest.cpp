// A connection while the daemon is there: requests, replies, look-ups, waiting, the end.
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <future>

#include "client/ConnectionFixture.h"
#include "client/Diagnostic.h"

namespace tal::test {
namespace {

using client::Message;
using testing::ElementsAre;
using testing::HasSubstr;

using Connection = ConnectionFixture;

TEST_F(Connection, SaysHelloAndNothingElseBeforeItIsAnswered) {
  daemon_.listen();
  client::Options durable = options();
  durable.durableAcknowledgement = true;
  tal_connection* connection = open(std::move(durable));
  ASSERT_EQ(tal_session_start(connection, 5), TAL_OK);
  peer_ = daemon_.accept();
  const Request hello = peer_->next();
  EXPECT_EQ(hello.text, R"(0(1, {"acknowledge": "durable"}))");
  EXPECT_EQ(tal_wait_connected(connection, 0, nullptr), TAL_NOT_CONNECTED);
  peer_->reply(hello.call, "\xA2" + cborText("version") + "\x01" + cborText("server") + cborText("fake 1"));
  EXPECT_EQ(tal_wait_connected(connection, kPatienceMs, nullptr), TAL_OK);
  EXPECT_EQ(peer_->next().text, "5(5)");
  EXPECT_THAT(told_.lines(1), ElementsAre("connected fake 1"));
}

TEST_F(Connection, WritesEveryRequestInItsShape) {
  tal_connection* connection = openAndWelcome();
  const Message configuration{{"HostApplicationDisplayID", "org.example.player"}};
  const std::int64_t several[] = {7, -8, 0};
  EXPECT_EQ(tal_session_create(connection, 7), TAL_OK);
  EXPECT_EQ(tal_session_set_service_type(connection, 7, TAL_SERVICE_TELEPHONY), TAL_OK);
  EXPECT_EQ(tal_session_set_configuration(connection, 7, configuration.get()), TAL_OK);
  EXPECT_EQ(tal_session_set_configuration(connection, 7, nullptr), TAL_OK);
  EXPECT_EQ(tal_session_start(connection, 7), TAL_OK);
  EXPECT_EQ(tal_session_send(connection, 7, configuration.get(), 0xFFFFFFFF, 65535), TAL_OK);
  EXPECT_EQ(tal_send(connection, numbered(1).get(), 1, 0, several, 3, 0), TAL_OK);
  EXPECT_EQ(tal_send(connection, numbered(2).get(), 1, 0, nullptr, 0, 0), TAL_OK);
  EXPECT_EQ(tal_session_stop(connection, 7), TAL_OK);
  EXPECT_EQ(tal_session_destroy(connection, 7), TAL_OK);
  EXPECT_EQ(tal_session_open(connection, INT64_MIN, TAL_SERVICE_UNKNOWN, configuration.get()), TAL_OK);
  EXPECT_EQ(tal_kill_service(connection), TAL_OK);
  EXPECT_THAT(peer_->serve(15),
              ElementsAre("1(7)", "2(2, 7)", R"(4({"HostApplicationDisplayID": "org.example.player"}, 7))",
                          "4(null, 7)", "5(7)",
                          R"(6({"HostApplicationDisplayID": "org.example.player"}, 4294967295, 65535, [7]))",
                          R"(6({"n": 1}, 1, 0, [7, -8, 0]))", R"(6({"n": 2}, 1, 0, null))", "7(7)", "8(7)",
                          "1(-9223372036854775808)", "2(65535, -9223372036854775808)",
                          R"(4({"HostApplicationDisplayID": "org.example.player"}, -9223372036854775808))",
                          "5(-9223372036854775808)", "11()"));
}

TEST_F(Connection, TellsOfRepliesByTheRequestInWhateverOrderTheyCome) {
  tal_connection* connection = openAndWelcome();
  tal_session_start(connection, 7);
  const std::uint64_t start = peer_->next().call;
  sendNumbered(7, 1);
  sendNumbered(7, 2);
  sendNumbered(7, 3);
  const std::uint64_t first = peer_->next().call;
  const std::uint64_t second = peer_->next().call;
  const std::uint64_t third = peer_->next().call;
  peer_->reply(third, "\xF6");
  peer_->replyError(first, 7);
  peer_->reply(first, "\xF6");  // Answered already: ignored, as is a call that was never made.
  peer_->reply(999, "\xF6");
  peer_->reply(second, "\xF6");
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  peer_->reply(start);  // Long after its place in the queue is gone, and twice.
  peer_->reply(start);
  peer_->replyError(0, 1);
  EXPECT_THAT(told_.lines(7),
              ElementsAre("connected fake 1", "reply 6 of 7 tag 3", "reply 6 of 7 tag 1 refused 7",
                          "reply 6 of 7 tag 2", "reply 5 of 7", "reply 5 of 7", "error 1"));
  const tal_statistics statistics = connection_->statistics();
  EXPECT_EQ(statistics.accepted, 3U);
  EXPECT_EQ(statistics.written, 3U);
  EXPECT_EQ(statistics.answered, 2U);
  EXPECT_EQ(statistics.dropped_refused, 1U);
  EXPECT_EQ(statistics.ignored_replies, 2U);
  EXPECT_EQ(statistics.queue_used_bytes, 0U);
}

TEST_F(Connection, AnswersEachLookUpOnce) {
  tal_connection* connection = openAndWelcome();
  const auto tell = [](void* told, const tal_reply* reply) {
    std::string line = Told::describe(*reply);
    if (reply->operation != TAL_LOOK_UP_ALL_REPORTERS) line += " type " + std::to_string(reply->service_type);
    line += " id " + std::to_string(reply->valid_id);
    for (std::size_t i = 0; i < reply->reporter_count; ++i) line += " " + std::to_string(reply->reporters[i]);
    static_cast<Told*>(told)->add(line);
  };
  Told answers;
  tal_look_up_service_type(connection, 0, tell, &answers);
  tal_look_up_service_type(connection, 7, tell, &answers);
  tal_look_up_reporter(connection, 7, tell, &answers);
  tal_look_up_all_reporters(connection, tell, &answers);
  tal_look_up_reporter(connection, 8, tell, &answers);
  tal_look_up_reporter(connection, 9, tell, &answers);
  std::vector<Request> requests(6);
  for (Request& request : requests) request = peer_->next();
  EXPECT_EQ(requests[1].text, "3(7)");
  EXPECT_EQ(requests[2].text, "9(7)");
  EXPECT_EQ(requests[3].text, "10()");
  peer_->reply(requests[0].call, cborUint16(65535));
  peer_->reply(requests[0].call, cborUint16(65535));
  peer_->reply(requests[1].call, "\x08");
  peer_->reply(requests[2].call, "\xA2" + cborText("reporterID") + "\x07" + cborText("serviceType") + "\x08");
  peer_->reply(requests[3].call, "\x82\x07\x27");
  peer_->replyError(requests[4].call, 1);
  peer_->reply(requests[5].call, "\x07");  // A number where there should be a map.
  EXPECT_THAT(answers.lines(6),
              ElementsAre("reply 3 of 0 type 65535 id 0", "reply 3 of 7 type 8 id 0",
                          "reply 9 of 7 type 8 id 7", "reply 10 of 0 id 0 7 -8",
                          "reply 9 of 8 refused 1 type 0 id 0", "reply 9 of 9 refused 0 type 0 id 0"));
  EXPECT_EQ(connection_->statistics().ignored_replies, 1U);
  tal_look_up_reporter(connection, 10, tell, &answers);
  EXPECT_EQ(connection_->close(std::chrono::milliseconds(0)), TAL_TIMED_OUT);
  EXPECT_EQ(answers.lines(7).back(), "reply 9 of 10 refused 0 type 0 id 0");
}

TEST_F(Connection, RefusesWhatItCannotSendAndCountsIt) {
  daemon_.listen();
  client::Options small = options();
  small.maxFrameBytes = 200;
  tal_connection* connection = open(std::move(small));
  Message open;
  tal_message_begin_map(open.get(), "a");
  const Message fits{{"k", std::string(150, 'x')}};
  const Message large{{"k", std::string(200, 'x')}};
  const std::vector<std::int64_t> many(TAL_MAX_REPORTERS + 1, 7);
  EXPECT_EQ(tal_session_send(connection, 7, fits.get(), 1, 0), TAL_OK);
  EXPECT_EQ(tal_session_send(connection, 7, large.get(), 1, 0), TAL_TOO_LARGE);
  EXPECT_EQ(tal_session_send(connection, 7, open.get(), 1, 0), TAL_INVALID);
  EXPECT_EQ(tal_session_send(connection, 7, nullptr, 1, 0), TAL_INVALID);
  EXPECT_EQ(tal_session_send(connection, 0, fits.get(), 1, 0), TAL_INVALID);
  EXPECT_EQ(connection_->send(fits, 1, 0, many), TAL_INVALID);
  EXPECT_EQ(tal_session_create(connection, 0), TAL_INVALID);
  EXPECT_EQ(tal_session_open(connection, 7, 1, large.get()), TAL_TOO_LARGE);
  EXPECT_EQ(tal_session_open(connection, 7, 1, open.get()), TAL_INVALID);
  EXPECT_EQ(tal_look_up_reporter(connection, 7, nullptr, nullptr), TAL_INVALID);
  EXPECT_EQ(tal_session_send(nullptr, 7, fits.get(), 1, 0), TAL_INVALID);
  const tal_statistics statistics = connection_->statistics();
  EXPECT_EQ(statistics.accepted, 1U);
  EXPECT_EQ(statistics.dropped_too_large, 1U);
  EXPECT_EQ(statistics.dropped_invalid, 4U);
}

TEST_F(Connection, TellsBadOptionsAtOnce) {
  tal_error error{};
  tal_options bad = {};
  bad.struct_bytes = sizeof bad;
  bad.queue_bytes = 1000;
  EXPECT_EQ(tal_connect(&bad, &error), nullptr);
  EXPECT_EQ(error.status, TAL_INVALID);
  EXPECT_THAT(error.message, HasSubstr("queue_bytes"));
  bad.queue_bytes = 0;
  bad.reconnect_min_ms = 10;
  bad.reconnect_max_ms = 5;
  EXPECT_EQ(tal_connect(&bad, nullptr), nullptr);
  EXPECT_THROW(client::Connection({.socketPath = "", .queueBytes = 1}), std::invalid_argument);
}

TEST_F(Connection, SaysWhyItIsNotAdmitted) {
  daemon_.listen();
  tal_connection* connection = open(options());
  peer_ = daemon_.accept();
  peer_->next();
  peer_->replyError(0, 3);
  peer_->close();
  tal_error error{};
  EXPECT_EQ(tal_wait_connected(connection, kPatienceMs, &error), TAL_REFUSED);
  EXPECT_EQ(error.code, 3);
  // It asks again, now in vain for another reason, and then with success.
  peer_ = daemon_.accept();
  peer_->replyError(peer_->next().call, 5);
  peer_->awaitEnd();
  peer_ = daemon_.welcome();
  EXPECT_THAT(told_.lines(3), ElementsAre("error 3", "error 5", "connected fake 1"));
}

TEST_F(Connection, FlushWaitsForAnswers) {
  openAndWelcome();
  sendNumbered(7, 1);
  const Request request = peer_->next();
  EXPECT_EQ(connection_->flush(std::chrono::milliseconds(0)), TAL_TIMED_OUT);
  auto flushed = std::async(std::launch::async, [&] { return connection_->flush(kPatience); });
  peer_->reply(request.call, "\xF6");
  EXPECT_EQ(flushed.get(), TAL_OK);
}

TEST_F(Connection, CloseWaitsForAnswersThenTakesNothingMore) {
  tal_connection* connection = openAndWelcome();
  sendNumbered(7, 1);
  auto closed = std::async(std::launch::async, [&] { return connection_->close(kPatience); });
  peer_->serve(1);
  EXPECT_EQ(closed.get(), TAL_OK);
  peer_->awaitEnd();
  EXPECT_EQ(sendNumbered(7, 2), TAL_CLOSED);
  EXPECT_EQ(tal_session_create(connection, 8), TAL_CLOSED);
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  EXPECT_EQ(tal_wait_connected(connection, 0, nullptr), TAL_CLOSED);
  EXPECT_EQ(connection_->close(kPatience), TAL_OK);
  EXPECT_EQ(connection_->statistics().dropped_closed, 1U);
  EXPECT_EQ(connection_->statistics().dropped_unanswered, 0U);
}

TEST_F(Connection, NeverWaitsInACallback) {
  daemon_.listen();
  std::promise<std::vector<tal_status>> statuses;
  std::promise<tal_connection*> handle;
  auto known = handle.get_future();
  client::Options asking = options();
  asking.onConnected = [&](std::string_view) {
    tal_connection* connection = known.get();
    statuses.set_value({tal_flush(connection, kPatienceMs),
                        tal_wait_connected(connection, kPatienceMs, nullptr),
                        tal_session_create(connection, 3), tal_connection_close(connection, kPatienceMs),
                        tal_session_create(connection, 4)});
  };
  handle.set_value(open(std::move(asking)));
  peer_ = daemon_.welcome();
  EXPECT_THAT(statuses.get_future().get(),
              ElementsAre(TAL_WRONG_THREAD, TAL_WRONG_THREAD, TAL_OK, TAL_WRONG_THREAD, TAL_CLOSED));
  peer_->awaitEnd();
}

TEST_F(Connection, CanBeFreedInACallbackAndCallsNoOther) {
  daemon_.listen();
  struct User {
    tal_connection* connection = nullptr;
    std::promise<void> lookedUp;
    std::atomic<int> calls{0};
  } user;
  tal_options options{};
  options.struct_bytes = sizeof options;
  options.socket_path = daemon_.path().c_str();
  options.callbacks.user = &user;
  options.callbacks.reply = [](void* given, const tal_reply*) {
    auto& it = *static_cast<User*>(given);
    if (++it.calls > 1) return;
    tal_look_up_reporter(
        it.connection, 1,
        [](void* again, const tal_reply* reply) {
          EXPECT_EQ(reply->error->status, TAL_CLOSED);
          static_cast<User*>(again)->lookedUp.set_value();
        },
        given);
    tal_connection_free(it.connection);
  };
  user.connection = tal_connect(&options, nullptr);
  peer_ = daemon_.welcome();
  tal_session_create(user.connection, 1);
  tal_session_create(user.connection, 2);
  const std::uint64_t first = peer_->next().call;
  const std::uint64_t second = peer_->next().call;
  peer_->sendRaw(FakePeer::success(first, "\xF5") + FakePeer::success(second, "\xF5"));
  peer_->awaitEnd();
  // The one answer of the look-up comes even so.
  EXPECT_EQ(user.lookedUp.get_future().wait_for(kPatience), std::future_status::ready);
  EXPECT_EQ(user.calls, 1);
}

TEST_F(Connection, IsDeadInAChildProcess) {
  tal_connection* connection = openAndWelcome();
  const Message message = numbered(1);
  const pid_t child = fork();
  if (child == 0) {
    bool dead = tal_session_send(connection, 7, message.get(), 1, 0) == TAL_CLOSED;
    dead = dead && tal_session_create(connection, 7) == TAL_CLOSED && tal_flush(connection, 1) == TAL_CLOSED;
    tal_connection_free(connection);
    _exit(dead ? 0 : 1);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  sendNumbered(7, 2);
  EXPECT_EQ(peer_->next().text, numberedText(7, 2));
}

TEST_F(Connection, LooksIntoTheQueueByItselfWhereSendsMustNotWakeIt) {
  daemon_.listen();
  client::Options silent = options();
  silent.pollInterval = std::chrono::milliseconds(1);
  open(std::move(silent));
  peer_ = daemon_.welcome();
  sendNumbered(7, 1);
  EXPECT_EQ(peer_->next().text, numberedText(7, 1));
}

}  // namespace
}  // namespace tal::test
