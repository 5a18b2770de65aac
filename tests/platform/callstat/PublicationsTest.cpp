#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/linux/callstat/CallstatSettings.h"
#include "platform/linux/callstat/Publications.h"

namespace tal {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;

class PublicationsTest : public testing::Test {
 protected:
  void add(std::int64_t number, std::int64_t session, double age_seconds = 0, std::size_t bytes = 2) {
    const std::string payload = '"' + std::string(bytes - 2, 'x') + '"';
    publications.add({.number = number,
                      .session = session,
                      .recorded_at = 1.5,
                      .category = 4,
                      .type = 1,
                      .payload = payload},
                     {.identifier = session * 10, .realtime = session == kRealtime}, now,
                     std::chrono::duration<double>(age_seconds));
  }
  /// The numbers of each publication that is due, with its topic.
  std::vector<std::string> due() {
    std::vector<std::string> result;
    while (const auto publication = publications.takeDue(now)) {
      std::string& text = result.emplace_back(publication->topic + ':');
      for (const auto number : publication->numbers) text += ' ' + std::to_string(number);
    }
    return result;
  }

  static constexpr std::int64_t kRealtime = 9;
  Publications::Instant now{1h};
  Publications publications{"t/d"};
};

TEST_F(PublicationsTest, RealTimeMessagesGoAtOnceAndOthersAfterASecond) {
  add(1, 1);
  add(2, kRealtime);
  add(3, 2);
  EXPECT_THAT(due(), ElementsAre("t/d/90/4/1: 2"));
  now += 999ms;
  add(4, 1);
  EXPECT_THAT(due(), IsEmpty());
  EXPECT_EQ(publications.nextDue(), now + 1ms);
  now += 1ms;
  EXPECT_THAT(due(), testing::UnorderedElementsAre("t/d/10: 1 4", "t/d/20: 3"));
  EXPECT_EQ(publications.nextDue(), std::nullopt);
}

TEST_F(PublicationsTest, WhatHasWaitedInTheOutboxDoesNotWaitAgain) {
  add(1, 1, 0.75);
  add(2, 2, 3600);
  add(3, 3, -3600);  // the clock was set
  EXPECT_THAT(due(), ElementsAre("t/d/20: 2"));
  now += 250ms;
  EXPECT_THAT(due(), ElementsAre("t/d/10: 1"));
  now += 750ms;
  EXPECT_THAT(due(), ElementsAre("t/d/30: 3"));
}

TEST_F(PublicationsTest, ABatchIsFullAt256MessagesOr256KiB) {
  for (int i = 1; i < 256; ++i) add(i, 1);
  EXPECT_THAT(due(), IsEmpty());
  add(256, 1);
  ASSERT_EQ(due().size(), 1U);
  add(300, 2, 0, 200 * 1024);
  add(301, 2, 0, 100 * 1024);
  EXPECT_THAT(due(), ElementsAre("t/d/20: 300"));
  publications.flush(3);
  publications.flush(2);
  EXPECT_THAT(due(), ElementsAre("t/d/20: 301"));
}

TEST_F(PublicationsTest, PayloadsAreAnObjectOrAnArrayOfThem) {
  add(1, kRealtime);
  const std::string object =
      R"(,"recorded_at":1.5,"category":4,"type":1,"session_info":{},"user_info":{},"payload":""})";
  EXPECT_EQ(publications.takeDue(now)->payload, R"({"number":1)" + object);
  add(2, 1);
  add(3, 1);
  publications.flushAll();
  EXPECT_EQ(publications.takeDue(now)->payload,
            R"([{"number":2)" + object + R"(,{"number":3)" + object + ']');
}

struct Address {
  const char* uri;
  const char* expected;  // "host port", with "tls" behind; empty: refused
};

TEST(BrokerAddressTest, IsWhatTheUriSays) {
  const std::vector<Address> rows{{"mqtt://host:1", "host 1"},
                                  {"mqtt://host", "host 1883"},
                                  {"mqtts://a.b/", "a.b 8883 tls"},
                                  {"mqtts://[::1]:65535", "::1 65535 tls"},
                                  {"mqtt://host:0", ""},
                                  {"mqtt://host:65536", ""},
                                  {"mqtt://host:1x", ""},
                                  {"mqtt://host:", ""},
                                  {"mqtt://:1883", ""},
                                  {"mqtt://[::1", ""},
                                  {"mqtt://user@host", ""},
                                  {"mqtt://host/path", ""},
                                  {"http://host", ""},
                                  {"host:1883", ""},
                                  {"", ""}};
  for (const Address& row : rows) {
    const auto address = parseBrokerAddress(row.uri);
    const std::string text =
        address ? address->host + ' ' + std::to_string(address->port) + (address->tls ? " tls" : "") : "";
    EXPECT_EQ(text, row.expected) << row.uri;
  }
}

}  // namespace
}  // namespace tal
