// The daemon goes away and comes back.
#include <algorithm>

#include "client/ConnectionFixture.h"

namespace tal::test {
namespace {

using client::Message;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;

class Reconnection : public ConnectionFixture {
 protected:
  /// The daemon dies and is there again.
  void restartDaemon() {
    peer_->close();
    peer_ = daemon_.welcome();
  }
};

TEST_F(Reconnection, KeepsWhatIsSentWhileNobodyIsThere) {
  tal_connection* connection = open(options());
  tal_session_open(connection, 7, TAL_SERVICE_TELEPHONY, nullptr);
  sendNumbered(7, 1);
  EXPECT_THAT(told_.lines(1), ElementsAre(HasSubstr("error 2")));  // ENOENT, told of once.
  tal_error error{};
  EXPECT_EQ(tal_wait_connected(connection, 0, &error), TAL_NOT_CONNECTED);
  EXPECT_THAT(error.message, HasSubstr(daemon_.path()));
  daemon_.listen();
  peer_ = daemon_.welcome();
  EXPECT_THAT(peer_->serve(4), ElementsAre("1(7)", "2(2, 7)", "5(7)", numberedText(7, 1)));
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  EXPECT_THAT(told_.lines(5), ElementsAre("error 2", "connected fake 1", "reply 1 of 7", "reply 2 of 7",
                                          "reply 6 of 7 tag 1"));
  EXPECT_EQ(connection_->statistics().connects, 1U);
}

TEST_F(Reconnection, SetsSessionsUpAsTheyStoodAndSendsOnlyTheUnansweredAgain) {
  tal_connection* connection = openAndWelcome();
  const Message first{{"a", 1}, {"RvHostApplicationDisplayID", "player"}};
  const Message second{{"a", 2}};
  tal_session_open(connection, 9, TAL_SERVICE_LONG_FORM_AUDIO, first.get());
  tal_session_set_configuration(connection, 9, second.get());
  tal_session_open(connection, 3, TAL_SERVICE_TELEPHONY, nullptr);
  tal_session_set_service_type(connection, 3, TAL_SERVICE_ALARMS);  // No longer started.
  tal_session_open(connection, 4, TAL_SERVICE_ALARMS, nullptr);
  tal_session_destroy(connection, 4);
  tal_session_open(connection, 5, TAL_SERVICE_ALARMS, nullptr);
  tal_session_set_service_type(connection, 5, TAL_SERVICE_ALARMS);
  for (int n = 1; n <= 4; ++n) sendNumbered(9, n);
  peer_->serve(4 + 1 + 3 + 1 + 3 + 1 + 3 + 1 + 1);
  tal_session_stop(connection, 5);
  EXPECT_EQ(peer_->next().text, numberedText(9, 2));
  const Request third = peer_->next();
  EXPECT_EQ(peer_->next().text, numberedText(9, 4));
  EXPECT_EQ(peer_->next().text, "7(5)");
  peer_->reply(third.call, "\xF6");
  EXPECT_EQ(told_.lines(16).back(), "reply 6 of 9 tag 3");
  restartDaemon();
  EXPECT_THAT(
      peer_->serve(12),
      ElementsAre(
          "1(9)", "2(7, 9)",
          R"(4({"HostApplicationDisplayID": "player", "RvHostApplicationDisplayID": "player", "a": 2}, 9))",
          "5(9)", "1(3)", "2(4, 3)", "1(5)", "2(4, 5)", "5(5)", numberedText(9, 2), numberedText(9, 4),
          "7(5)"));
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  const tal_statistics statistics = connection_->statistics();
  EXPECT_EQ(statistics.resent, 2U);
  EXPECT_EQ(statistics.answered, 4U);
  EXPECT_EQ(statistics.connects, 2U);
  restartDaemon();
  EXPECT_EQ(peer_->serve(8).back(), "2(4, 5)");  // Stopped by now.
  sendNumbered(9, 5);
  EXPECT_EQ(peer_->next().text, numberedText(9, 5));
}

TEST_F(Reconnection, RepeatsWhatWasAnsweredOfASessionWhileAnOlderMessageWaits) {
  tal_connection* connection = openAndWelcome();
  tal_session_open(connection, 7, TAL_SERVICE_TELEPHONY, nullptr);
  peer_->serve(3);
  sendNumbered(7, 1);
  peer_->next();
  tal_session_stop(connection, 7);
  tal_session_open(connection, 8, TAL_SERVICE_ALARMS, nullptr);
  sendNumbered(8, 2);
  sendNumbered(8, 3);
  peer_->serve(5);
  EXPECT_EQ(told_.lines(7).back(), "reply 6 of 8 tag 2");
  restartDaemon();
  EXPECT_THAT(peer_->serve(9), ElementsAre("1(7)", "2(2, 7)", "5(7)", numberedText(7, 1), "7(7)", "1(8)",
                                           "2(4, 8)", "5(8)", numberedText(8, 3)));
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  // The program hears of each answer once.
  EXPECT_THAT(told_.lines(11),
              ElementsAre("connected fake 1", "reply 1 of 7", "reply 2 of 7", "reply 7 of 7", "reply 1 of 8",
                          "reply 2 of 8", "reply 6 of 8 tag 2", StartsWith("disconnected"),
                          "connected fake 1", "reply 6 of 7 tag 1", "reply 6 of 8 tag 3"));
}

TEST_F(Reconnection, ARefusedRequestHasNoEffectOnTheSetUp) {
  tal_connection* connection = openAndWelcome();
  const Message configuration{{"a", 1}};
  tal_session_create(connection, 7);
  tal_session_set_configuration(connection, 7, configuration.get());
  peer_->serve(1);
  peer_->replyError(peer_->next().call, 1);
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  restartDaemon();
  sendNumbered(7, 1);
  EXPECT_THAT(peer_->serve(2), ElementsAre("1(7)", numberedText(7, 1)));
}

TEST_F(Reconnection, TheAnswerToTheLibrarysStartIsTheProgramsAnswer) {
  tal_connection* connection = openAndWelcome();
  tal_session_open(connection, 7, TAL_SERVICE_TEST, nullptr);
  peer_->serve(3);
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  restartDaemon();
  peer_->serve(2);
  peer_->reply(peer_->next().call);
  EXPECT_THAT(told_.lines(6), ElementsAre("connected fake 1", "reply 1 of 7", "reply 2 of 7",
                                          StartsWith("disconnected"), "connected fake 1", "reply 5 of 7"));
}

TEST_F(Reconnection, AFrameThatIsBrokenOffAnswersNothing) {
  openAndWelcome();
  sendNumbered(7, 1);
  peer_->next();
  peer_->sendRaw(std::string("\x04\0\0\0\x83\x02", 6));
  restartDaemon();
  EXPECT_THAT(peer_->serve(1), ElementsAre(numberedText(7, 1)));
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  EXPECT_EQ(connection_->statistics().answered, 1U);
}

class Nonsense : public Reconnection, public testing::WithParamInterface<std::string> {};

TEST_P(Nonsense, EndsTheConnectionAndNothingElse) {
  openAndWelcome();
  peer_->sendRaw(std::string(1, static_cast<char>(GetParam().size())) + std::string(3, '\0') + GetParam());
  peer_->awaitEnd();
  restartDaemon();
  sendNumbered(7, 1);
  EXPECT_THAT(peer_->serve(1), ElementsAre(numberedText(7, 1)));
}

INSTANTIATE_TEST_SUITE_P(
    Replies, Nonsense,
    testing::Values("", "\xFF", "\x01", "\x82\x01\x01", "\x83\x20\x01\xF6", "\x83\x02\x02\xF6",
                    "\x83\x02\x01\x01", "\x83\x02\x01\xA1\x01\x01", std::string("\x83\x02\x00\x82\x01", 5),
                    std::string("\x83\x02\x00\xF6\xF6", 5),
                    std::string("\x83\x02\x00\x9B\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF", 12)));

TEST_F(Reconnection, CountsWhatDoesNotFitAndReportsItOnceTheDaemonIsBack) {
  client::Options small = options();
  small.queueBytes = 65536;
  tal_connection* connection = open(std::move(small));
  const Message spoiled(0);
  tal_message_end(spoiled.get());
  tal_session_open(connection, 7, TAL_SERVICE_TELEPHONY, nullptr);
  tal_session_open(connection, 8, TAL_SERVICE_TELEPHONY, nullptr);
  int kept = 0;
  while (sendNumbered(8, kept) == TAL_OK) ++kept;
  EXPECT_EQ(sendNumbered(8, kept), TAL_QUEUE_FULL);
  EXPECT_EQ(connection_->send(spoiled, 1, 0, {8}), TAL_INVALID);
  EXPECT_GT(kept, 65536 / 100);
  EXPECT_EQ(connection_->statistics().dropped_queue_full, 2U);

  // Sessions can still be opened and closed, up to a point; an end is never lost, and nothing overtakes it.
  std::size_t opened = 0;
  while (tal_session_create(connection, 100 + static_cast<int>(opened)) == TAL_OK) ++opened;
  EXPECT_GE(opened, 20U);
  EXPECT_EQ(tal_session_destroy(connection, 100), TAL_OK);
  EXPECT_EQ(tal_session_create(connection, 100), TAL_QUEUE_FULL);
  EXPECT_EQ(connection_->flush(std::chrono::milliseconds(0)), TAL_TIMED_OUT);

  daemon_.listen();
  peer_ = daemon_.welcome();
  peer_->serve(6);
  for (int n = 0; n < kept; ++n) ASSERT_THAT(peer_->serve(1), ElementsAre(numberedText(8, n)));
  peer_->serve(opened);
  std::vector<std::string> last = peer_->serve(2);
  std::sort(last.begin(), last.end());
  EXPECT_THAT(
      last[0],
      StartsWith(R"(6({"client_dropped_messages": 3, "client_dropped_queue_full": 2, )"
                 R"("client_dropped_too_large": 0, "client_dropped_invalid": 1, )"
                 R"("client_dropped_refused": 0, "client_reconnects": 0, "talreporting_timestamp": )"));
  EXPECT_THAT(last[0], testing::EndsWith("}, 1, 6, [7])"));  // The first session that is started.
  EXPECT_EQ(last[1], "8(100)");
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);

  // Reported is reported; what is lost later is reported after the next interruption.
  restartDaemon();
  peer_->serve(6 + opened - 1);
  tal_session_send(connection, 7, nullptr, 1, 0);
  restartDaemon();
  peer_->serve(6 + opened - 1);
  EXPECT_THAT(peer_->next().text, HasSubstr(R"("client_dropped_messages": 1, )"));
}

TEST_F(Reconnection, GivesUpTheFrameThatTheDaemonFindsTooLong) {
  openAndWelcome();
  const Message large{{"k", std::string(5000, 'x')}};
  sendNumbered(7, 1);
  connection_->send(large, 1, 0, {7}, 2);
  sendNumbered(7, 3);
  for (int i = 0; i < 3; ++i) peer_->next();
  peer_->replyError(0, 4);
  restartDaemon();
  EXPECT_THAT(peer_->serve(2), ElementsAre(numberedText(7, 1), numberedText(7, 3)));
  EXPECT_EQ(told_.lines(2)[1], "reply 6 of 7 tag 2 refused 4");
  EXPECT_EQ(connection_->send(large, 1, 0, {7}), TAL_TOO_LARGE);
}

TEST_F(Reconnection, NeverEndsTheServiceTwice) {
  tal_connection* connection = openAndWelcome();
  sendNumbered(7, 1);
  tal_kill_service(connection);
  sendNumbered(7, 2);
  peer_->next();
  EXPECT_EQ(peer_->next().text, "11()");
  restartDaemon();
  EXPECT_THAT(peer_->serve(2), ElementsAre(numberedText(7, 1), numberedText(7, 2)));
}

TEST_F(Reconnection, CloseGivesUpWhatNobodyComesFor) {
  tal_connection* connection = open(options());
  tal_session_open(connection, 7, TAL_SERVICE_TELEPHONY, nullptr);
  sendNumbered(7, 1);
  sendNumbered(7, 2);
  EXPECT_EQ(connection_->close(std::chrono::milliseconds(1)), TAL_TIMED_OUT);
  EXPECT_EQ(connection_->statistics().dropped_unanswered, 2U);
}

}  // namespace
}  // namespace tal::test
