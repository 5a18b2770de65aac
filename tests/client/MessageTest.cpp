// Messages: what each kind of value becomes, and what spoils one.
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <limits>
#include <string>

#include "client/FakeDaemon.h"
#include "client/talreporting.hpp"

namespace tal::test {
namespace {

using client::Message;

struct Encoding {
  const char* name;
  std::function<void(tal_message*)> build;
  std::string text;
};

class MessageEncoding : public testing::TestWithParam<Encoding> {};

/// Sends the message to a daemon, which reads it with another decoder.
TEST_P(MessageEncoding, ArrivesAsBuilt) {
  FakeDaemon daemon;
  daemon.listen();
  client::Connection connection({.socketPath = daemon.path()});
  const auto peer = daemon.welcome();
  Message message(8);  // Smaller than any of them, so that it has to grow.
  GetParam().build(message.get());
  ASSERT_EQ(message.status(), TAL_OK);
  ASSERT_EQ(connection.broadcast(message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START), TAL_OK);
  EXPECT_EQ(peer->next().text, "6(" + GetParam().text + ", 4, 1, null)");
}

INSTANTIATE_TEST_SUITE_P(
    Values, MessageEncoding,
    testing::Values(
        Encoding{"Nothing", [](tal_message*) {}, "{}"},
        Encoding{"Strings",
                 [](tal_message* m) {
                   tal_message_add_string(m, "ascii", "Music");
                   tal_message_add_string(m, "grün", "\xF0\x9F\x8E\xB5 tone");
                   tal_message_add_string(m, "", "");
                 },
                 "{\"ascii\": \"Music\", \"grün\": \"\xF0\x9F\x8E\xB5 tone\", \"\": \"\"}"},
        Encoding{"SignedIntegers",
                 [](tal_message* m) {
                   tal_message_add_int(m, "a", 0);
                   tal_message_add_int(m, "b", -1);
                   tal_message_add_int(m, "c", INT64_MIN);
                   tal_message_add_int(m, "d", INT64_MAX);
                 },
                 R"({"a": 0, "b": -1, "c": -9223372036854775808, "d": 9223372036854775807})"},
        Encoding{"UnsignedIntegers",
                 [](tal_message* m) {
                   tal_message_add_uint(m, "a", 23);
                   tal_message_add_uint(m, "b", 24);
                   tal_message_add_uint(m, "c", UINT64_MAX);
                 },
                 R"({"a": 23, "b": 24, "c": 18446744073709551615})"},
        Encoding{"Doubles",
                 [](tal_message* m) {
                   tal_message_add_double(m, "a", 0.1);
                   tal_message_add_double(m, "b", -std::numeric_limits<double>::infinity());
                   tal_message_add_double(m, "c", std::numeric_limits<double>::quiet_NaN());
                 },
                 R"({"a": 0.10000000000000001, "b": -inf, "c": nan})"},
        Encoding{"BooleansDatesAndData",
                 [](tal_message* m) {
                   tal_message_add_bool(m, "on", true);
                   tal_message_add_bool(m, "off", false);
                   tal_message_add_date(m, "at", 1767225600.25);
                   tal_message_add_data(m, "bytes", "\x00\xFF", 2);
                   tal_message_add_data(m, "none", nullptr, 0);
                 },
                 R"({"on": true, "off": false, "at": 1(1767225600.25), "bytes": h'00ff', "none": h''})"},
        Encoding{"Nested",
                 [](tal_message* m) {
                   tal_message_begin_array(m, "list");
                   tal_message_add_int(m, nullptr, 1);
                   tal_message_begin_map(m, nullptr);
                   tal_message_add_string(m, "k", "v");
                   tal_message_end(m);
                   tal_message_begin_array(m, nullptr);
                   tal_message_end(m);
                   tal_message_end(m);
                   tal_message_add_int(m, "after", 2);
                 },
                 R"({"list": [1, {"k": "v"}, []], "after": 2})"},
        Encoding{"ThirtyKeys",
                 [](tal_message* m) {
                   for (int i = 0; i < 30; ++i) tal_message_add_int(m, std::to_string(i).c_str(), i);
                 },
                 [] {
                   std::string text = "{";
                   for (int i = 0; i < 30; ++i) {
                     text += (i ? ", \"" : "\"") + std::to_string(i) + "\": " + std::to_string(i);
                   }
                   return text + "}";
                 }()}),
    [](const auto& row) { return row.param.name; });

struct Mistake {
  const char* name;
  std::function<void(tal_message*)> make;
};

class MessageMistake : public testing::TestWithParam<Mistake> {};

TEST_P(MessageMistake, SpoilsTheMessageUntilItIsReset) {
  Message message;
  GetParam().make(message.get());
  EXPECT_EQ(message.status(), TAL_INVALID);
  const tal_connection* none = nullptr;
  EXPECT_FALSE(tal_on_library_thread(none));
  message.reset();
  message.add("a", 1);
  EXPECT_EQ(message.status(), TAL_OK);
  EXPECT_EQ(tal_message_bytes(message.get()), 4U);
}

/// Opens `levels` arrays and closes them again.
void nest(tal_message* message, int levels) {
  tal_message_begin_array(message, "deep");
  for (int i = 1; i < levels; ++i) tal_message_begin_array(message, nullptr);
  for (int i = 0; i < levels; ++i) tal_message_end(message);
}

INSTANTIATE_TEST_SUITE_P(
    Mistakes, MessageMistake,
    testing::Values(
        Mistake{"NoKeyInAMap", [](tal_message* m) { tal_message_add_int(m, nullptr, 1); }},
        Mistake{"KeyInAnArray",
                [](tal_message* m) {
                  tal_message_begin_array(m, "a");
                  tal_message_add_int(m, "k", 1);
                  tal_message_end(m);
                }},
        Mistake{"LeftOpen", [](tal_message* m) { tal_message_begin_map(m, "a"); }},
        Mistake{"EndWithoutBegin", [](tal_message* m) { tal_message_end(m); }},
        Mistake{"NoText", [](tal_message* m) { tal_message_add_string(m, "a", nullptr); }},
        Mistake{"NoData", [](tal_message* m) { tal_message_add_data(m, "a", nullptr, 1); }},
        Mistake{"KeyCutOff", [](tal_message* m) { tal_message_add_int(m, "abcdefgh\xC3", 1); }},
        Mistake{"StrayContinuation", [](tal_message* m) { tal_message_add_string(m, "a", "\x80"); }},
        Mistake{"Overlong", [](tal_message* m) { tal_message_add_string(m, "a", "\xE0\x80\xAF"); }},
        Mistake{"Surrogate", [](tal_message* m) { tal_message_add_string(m, "a", "\xED\xA0\x80"); }},
        Mistake{"BeyondUnicode", [](tal_message* m) { tal_message_add_string(m, "a", "\xF4\x90\x80\x80"); }},
        Mistake{"TooDeep", [](tal_message* m) { nest(m, TAL_MAX_NESTING); }}),
    [](const auto& row) { return row.param.name; });

TEST(Message, NestsAsDeepAsItSays) {
  Message message;
  nest(message.get(), TAL_MAX_NESTING - 1);
  EXPECT_EQ(message.status(), TAL_OK);
}

TEST(Message, OfNoMemoryIsHarmless) {
  tal_message_add_int(nullptr, "a", 1);
  tal_message_end(nullptr);
  EXPECT_EQ(tal_message_status(nullptr), TAL_INVALID);
  tal_message_free(nullptr);
}

}  // namespace
}  // namespace tal::test
