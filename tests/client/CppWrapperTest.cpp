// The C++ wrapper: ownership, types, and the look-ups that wait.
#include <future>

#include "client/ConnectionFixture.h"

namespace tal::test {
namespace {

using client::Message;
using testing::ElementsAre;
using Wrapper = ConnectionFixture;

TEST_F(Wrapper, AddsValuesByTheirTypes) {
  openAndWelcome();
  const std::string text = "text";
  Message message{{"b", true}, {"i", -1}, {"u", 2U}, {"f", 0.5F}, {"s", text}, {"l", "literal"}};
  message.add("d", Message::Date(std::chrono::seconds(10))).add("x", Message::Data{"\x01", 1});
  message.addArray("a", [](Message& array) {
    array.append(1).append("two").appendArray([](Message&) {}).appendMap([](Message& map) {
      map.add("k", 3);
    });
  });
  message.addMap("m", [](Message& map) { map.add("k", false); });
  EXPECT_EQ(connection_->broadcast(message, 1, 0), TAL_OK);
  EXPECT_EQ(
      peer_->next().text,
      R"(6({"b": true, "i": -1, "u": 2, "f": 0.5, "s": "text", "l": "literal", "d": 1(10), "x": h'01', )"
      R"("a": [1, "two", [], {"k": 3}], "m": {"k": false}}, 1, 0, null))");
}

TEST_F(Wrapper, ASessionLivesAsLongAsItsObject) {
  openAndWelcome();
  {
    const Message configuration{{"a", 1}};
    client::Session first(*connection_, TAL_SERVICE_ALERTS, &configuration, 7);
    client::Session moved(std::move(first));
    // NOLINTNEXTLINE(bugprone-use-after-move, clang-analyzer-cplusplus.Move): what it then does is promised.
    EXPECT_EQ(first.send(numbered(1), 1, 0), TAL_CLOSED);
    EXPECT_EQ(moved.send(numbered(2), 1, 0), TAL_OK);
    client::Session other(*connection_, TAL_SERVICE_ALERTS, nullptr, 8);
    other = std::move(moved);
    EXPECT_EQ(other.stop(), TAL_OK);
    connection_.reset();  // The session keeps it.
    EXPECT_THAT(peer_->serve(10),
                ElementsAre("1(7)", "2(10, 7)", R"(4({"a": 1}, 7))", "5(7)", R"(6({"n": 2}, 1, 0, [7]))",
                            "1(8)", "2(10, 8)", "5(8)", "8(8)", "7(7)"));
  }
  peer_->awaitEnd();
}

TEST_F(Wrapper, LookUpsWaitForTheirAnswers) {
  openAndWelcome();
  const auto later = [](auto call) { return std::async(std::launch::async, call); };
  auto type = later([&] { return connection_->serviceType(7, kPatience); });
  peer_->reply(peer_->next().call, "\x08");
  EXPECT_EQ(type.get().value, 8);
  auto all = later([&] { return connection_->allReporters(kPatience); });
  peer_->reply(peer_->next().call, "\x81\x07");
  EXPECT_THAT(*all.get().value, ElementsAre(7));
  auto reporter = later([&] { return connection_->reporter(7, kPatience); });
  peer_->replyError(peer_->next().call, 1);
  EXPECT_EQ(reporter.get().error.code, 1);
  // An answer that comes after the wait was given up finds its memory still there.
  EXPECT_EQ(connection_->reporter(7, std::chrono::milliseconds(0)).error.status, TAL_TIMED_OUT);
  peer_->replyError(peer_->next().call, 1);
  EXPECT_EQ(connection_->flush(kPatience), TAL_OK);
  connection_->close(std::chrono::milliseconds(0));
  EXPECT_EQ(connection_->reporter(7, kPatience).error.status, TAL_CLOSED);
}

}  // namespace
}  // namespace tal::test
