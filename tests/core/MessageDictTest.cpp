#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "core/MessageDict.h"

namespace tal {
namespace {

using ::testing::ElementsAre;

std::vector<std::string> keysOf(const MessageDict& dict) {
  std::vector<std::string> keys;
  for (const auto& [key, value] : dict) keys.emplace_back(key);
  return keys;
}

TEST(MessageDict, KeepsTheOrderOfInsertion) {
  MessageDict dict{{"b", 1}, {"a", 2}};
  dict.set("c", 3);
  dict.set("b", 4);
  EXPECT_THAT(keysOf(dict), ElementsAre("b", "a", "c"));
  EXPECT_EQ(*dict.find("b"), MessageValue(4));
  EXPECT_TRUE(dict.erase("a"));
  EXPECT_FALSE(dict.erase("a"));
  dict.set("a", 5);
  EXPECT_THAT(keysOf(dict), ElementsAre("b", "c", "a"));
}

TEST(MessageDict, CopiesAreIndependentThoughTheyShare) {
  const MessageDict original{{"a", 1}, {"b", "a text that is longer than any inline one"}};
  MessageDict changed = original;
  MessageDict extended = original;
  MessageDict extended_otherwise = original;
  MessageDict shortened = original;
  changed.set("a", 2);
  extended.set("c", 3);
  extended_otherwise.set("d", 4);
  shortened.erase("a");
  EXPECT_EQ(original.text(), "{a=1, b=a text that is longer than any inline one}");
  EXPECT_EQ(*changed.find("a"), MessageValue(2));
  EXPECT_THAT(keysOf(extended), ElementsAre("a", "b", "c"));
  EXPECT_THAT(keysOf(extended_otherwise), ElementsAre("a", "b", "d"));
  EXPECT_THAT(keysOf(shortened), ElementsAre("b"));
}

TEST(MessageDict, EqualityIgnoresOrderAndWhatItIsToldTo) {
  const MessageDict dict{{"a", 1}, {"b", 2}, {"t", 3}};
  EXPECT_EQ(dict, (MessageDict{{"b", 2.0}, {"t", 3}, {"a", true}}));
  EXPECT_FALSE(dict == (MessageDict{{"a", 1}, {"b", 2}}));
  EXPECT_FALSE(dict == (MessageDict{{"a", 1}, {"b", 2}, {"u", 3}}));

  const std::array<MessageKey, 2> ignored{"t", "absent"};
  MessageDict later = dict;
  later.set("t", 99);
  EXPECT_TRUE(dict.equalsIgnoring(later, ignored)) << "one shape";
  EXPECT_TRUE(dict.equalsIgnoring(MessageDict{{"b", 2}, {"a", 1}}, ignored)) << "other shape";
  later.set("a", 0);
  EXPECT_FALSE(dict.equalsIgnoring(later, ignored));
  EXPECT_FALSE(dict.equalsIgnoring(MessageDict{{"b", 2}, {"a", 1}, {"c", 1}}, ignored));
}

TEST(MessageDict, MergeReplacesAndAppends) {
  MessageDict dict;
  dict.merge({{"a", 1}, {"b", 2}});
  const MessageDict before = dict;
  dict.merge({{"x", 9}, {"b", 3}, {"c", 4}});
  EXPECT_EQ(dict.text(), "{a=1, b=3, x=9, c=4}");
  dict.merge(before);
  dict.merge(dict);
  EXPECT_EQ(dict.text(), "{a=1, b=2, x=9, c=4}");
  EXPECT_EQ(before.text(), "{a=1, b=2}");
}

TEST(MessageDict, DeepCopyOfNestedValuesIsIndependent) {
  MessageDict dict{{"inner", MessageDict{{"k", 1}}}};
  const MessageDict copy = dict.deepCopy();
  const_cast<MessageValue*>(dict.find("inner"))->dict()->set("k", 2);
  EXPECT_EQ(copy.text(), "{inner={k=1}}");
}

TEST(MessageDict, KnowsAboutBlanksInKeys) {
  MessageDict dict{{"a", 1}};
  EXPECT_FALSE(dict.hasKeyWithBlank());
  dict.set("a key", 1);
  EXPECT_TRUE(dict.hasKeyWithBlank());
  dict.erase("a key");
  EXPECT_FALSE(dict.hasKeyWithBlank());
}

TEST(MessageDict, FootprintCountsASharedShapeOnceAndItsValuesEachTime) {
  const std::string text(1000, 'x');
  MessageDict dict{{"a key of some length that is no inline text", text}};
  const std::size_t first = dict.footprintBytes();
  const std::size_t second = dict.footprintBytes();
  EXPECT_GT(first, second);
  EXPECT_GE(second, text.size());
}

// Random operations on dictionaries that share shapes and blocks in every way,
// against a map as the plain truth; up to sizes beyond the linear search.
TEST(MessageDict, AgreesWithAMapUnderRandomOperations) {
  std::mt19937 random(20260131);
  const auto below = [&random](std::size_t n) { return random() % n; };
  std::vector<std::pair<MessageDict, std::map<std::string, std::int64_t>>> pool(8);
  for (int step = 0; step < 20000; ++step) {
    auto& [dict, truth] = pool[below(pool.size())];
    const std::string key = "key " + std::to_string(below(60));
    const auto number = static_cast<std::int64_t>(below(1000));
    switch (below(10)) {
      case 0:
        EXPECT_EQ(dict.erase(key), truth.erase(key) == 1);
        break;
      case 1:
      case 2: {
        const auto source = pool[below(pool.size())];
        pool[below(pool.size())] = source;
        break;
      }
      case 3: {
        const auto source = pool[below(pool.size())];
        dict.merge(source.first);
        for (const auto& [k, v] : source.second) truth[k] = v;
        break;
      }
      default:
        dict.set(key, number);
        truth[key] = number;
    }
    ASSERT_EQ(dict.size(), truth.size());
    const MessageValue* found = dict.find(key);
    ASSERT_EQ(found != nullptr, truth.contains(key));
    if (found) {
      ASSERT_EQ(found->toInt64(), truth[key]);
    }
  }
  for (const auto& [dict, truth] : pool) {
    for (const auto& [key, value] : dict) EXPECT_EQ(value.toInt64(), truth.at(std::string(key)));
  }
}

}  // namespace
}  // namespace tal
