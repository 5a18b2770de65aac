#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/derived/TalReportingSessionWorkerUtility.h"

namespace tal {
namespace {

using test::messageAt;
using Messages = TalReportingSessionWorkerUtility::Messages;

constexpr std::array<MessageKey, 2> kKeys{"accessory", "spatial"};

// "a" and "s" are messages with one of the two keys, "b" has both, "x" neither.
Messages messagesOf(const std::vector<std::pair<char, double>>& rows) {
  Messages messages;
  for (const auto& [kind, time] : rows) {
    MessageDict dict{{std::string("own ") + kind + std::to_string(time), 1}};
    if (kind == 'a' || kind == 'b') dict.set("accessory", 1);
    if (kind == 's' || kind == 'b') dict.set("spatial", 1);
    messages.push_back(messageAt(time, std::move(dict)));
  }
  return messages;
}

TEST(CombineRapidMessages, FoldsBursts) {
  struct Row {
    const char* name;
    std::vector<std::pair<char, double>> messages;
    std::vector<double> times;  // of the result
  };
  const std::vector<Row> rows{
      {"nothing", {}, {}},
      {"under the pause", {{'a', 10}, {'s', 14.9}}, {14.9}},
      {"at the pause", {{'a', 10}, {'s', 15}}, {10, 15}},
      {"the same key twice", {{'a', 10}, {'a', 10.1}}, {10, 10.1}},
      {"a repeated key begins a new burst", {{'a', 10}, {'s', 11}, {'a', 12}, {'s', 13}}, {11, 13}},
      {"others neither join nor end a burst", {{'a', 10}, {'x', 11}, {'s', 12}}, {12, 11}},
      {"both keys count as the first", {{'b', 10}, {'s', 11}, {'b', 12}}, {11, 12}},
      {"one that comes too late begins no burst", {{'a', 10}, {'s', 20}, {'a', 21}, {'s', 22}}, {10, 20, 22}},
      {"without stamps", {{'a', 0}, {'s', 0}}, {0}}};
  for (const Row& row : rows) {
    const Messages given = messagesOf(row.messages);
    const Messages result = TalReportingSessionWorkerUtility::combineRapidMessages(given, kKeys, 5.0);
    std::vector<double> times;
    for (const auto& message : result) times.push_back(message->epochTime());
    EXPECT_EQ(times, row.times) << row.name;
  }
}

TEST(CombineRapidMessages, ExtendsTheFirstRecordOfABurstItself) {
  const Messages given = messagesOf({{'a', 10}, {'s', 12}});
  const Messages result = TalReportingSessionWorkerUtility::combineRapidMessages(given, kKeys, 5.0);
  ASSERT_EQ(result.size(), 1U);
  EXPECT_EQ(result[0], given[0]);
  EXPECT_TRUE(given[0]->message().contains("spatial"));
  EXPECT_FALSE(given[1]->message().contains("accessory"));
}

TEST(CombineRapidMessages, WithoutKeysChangesNothing) {
  const Messages given = messagesOf({{'a', 10}, {'s', 11}, {'b', 11}});
  EXPECT_EQ(TalReportingSessionWorkerUtility::combineRapidMessages(given, {}, 5.0), given);
  EXPECT_FALSE(given[0]->message().contains("spatial"));
}

TEST(CombineRapidMessages, NeverLosesAKey) {
  std::mt19937 random(4);
  for (int round = 0; round < 300; ++round) {
    std::vector<std::pair<char, double>> rows;
    double time = 100;
    for (std::size_t i = 0; i < random() % 30; ++i) {
      rows.emplace_back("asbx"[random() % 4], time += static_cast<double>(random() % 80) / 10);
    }
    const Messages given = messagesOf(rows);
    std::set<std::string> before;
    for (const auto& message : given) {
      for (const auto& [key, value] : message->message()) before.emplace(key);
    }
    std::set<std::string> after;
    for (const auto& message : TalReportingSessionWorkerUtility::combineRapidMessages(given, kKeys, 5.0)) {
      for (const auto& [key, value] : message->message()) after.emplace(key);
    }
    ASSERT_EQ(after, before);
  }
}

TEST(ParleyXYerrorMessage, IsKnownByAKeyThatBeginsSo) {
  const auto is = [](MessageDict dict) {
    return TalReportingSessionWorkerUtility::isParleyXYerrorMessage(*messageAt(1, std::move(dict)));
  };
  EXPECT_TRUE(is({{"other", 1}, {"vmox_invalid_x", 1}}));
  EXPECT_FALSE(is({{"a_vmox_invalid_", 1}, {"vmox_invalid", 1}}));
  EXPECT_FALSE(is({}));
}

}  // namespace
}  // namespace tal
