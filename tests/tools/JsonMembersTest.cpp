#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <utility>
#include <vector>

#include "tools/talctl/ArgumentValue.h"
#include "tools/talctl/report/JsonMembers.h"

namespace tal::talctl {
namespace {

using Members = std::vector<std::pair<std::string, std::string>>;

Members membersOf(std::string_view text, bool& complete) {
  JsonMembers members(text);
  Members all;
  while (members.next()) all.emplace_back(members.key(), members.value());
  complete = members.isComplete();
  return all;
}

/// Any JSON value, the deeper the simpler.
Json randomValue(std::mt19937& random, int depth) {
  const auto below = [&](unsigned most) { return random() % most; };
  const char* const texts[] = {"", "plain", "\"", "\\", "\\\"", "a\\", "{[,:]}", "\n\t\x01", "é日📞", "}\"{"};
  switch (below(depth > 0 ? 7 : 5)) {
    case 0:
      return static_cast<int>(random());
    case 1:
      return static_cast<double>(random()) / 3e3;
    case 2:
      return below(2) == 1;
    case 3:
      return nullptr;
    case 4:
      return texts[below(std::size(texts))];
    case 5: {
      Json array = Json::array();
      for (auto i = below(4); i > 0; --i) array.push_back(randomValue(random, depth - 1));
      return array;
    }
    default: {
      Json object = Json::object();
      for (auto i = below(4); i > 0; --i)
        object[texts[below(std::size(texts))]] = randomValue(random, depth - 1);
      return object;
    }
  }
}

TEST(JsonMembers, FindWhatAFullParserFinds) {
  std::mt19937 random(7);
  for (int round = 0; round < 3000; ++round) {
    Json object = Json::object();
    for (int i = 0; i < 6; ++i) object["k" + std::to_string(i)] = randomValue(random, 3);
    const std::string text = object.dump(round % 3 == 0 ? 2 : -1);
    Members expected;
    for (const auto& [key, value] : object.items()) expected.emplace_back(key, value.dump());
    bool complete = false;
    Members found = membersOf(text, complete);
    for (auto& [key, value] : found) value = Json::parse(value).dump();
    ASSERT_EQ(found, expected) << text;
    ASSERT_TRUE(complete) << text;
  }
}

TEST(JsonMembers, EndWhereATextIsNoObject) {
  for (const char* const text :
       {"", " ", "[1]", "1", "{", "{\"a\"", "{\"a\":", "{\"a\":}", "{\"a\":1", "{\"a\":1,", "{a:1}",
        "{\"a\":\"b", "{\"a\":\"b\\\"", "{\"a\":[1}", "{\"a\":{\"b\":\"]", "{\"a\":1}x", "{\"a\" 1}",
        "{\"a\":1 \"b\":2}", "{\"a\":[\"x]}"}) {
    bool complete = true;
    membersOf(text, complete);
    EXPECT_FALSE(complete) << text;
  }
}

TEST(JsonMembers, ReadNumbersAndTextsOfAnyType) {
  const struct {
    const char* value;
    double number;
    const char* text;
  } kCases[] = {{"", 0, "unknown"},
                {"null", 0, "unknown"},
                {"\"\"", 0, "unknown"},
                {"-1.5e2", -150, "-1.5e2"},
                {"true", 0, "true"},
                {"\"1\"", 0, "1"},
                {"\"a\\u0000\\\"b\\n\"", 0, nullptr},
                {"[\"HDMI\",\"Speaker\",2]", 0, "HDMI, Speaker, 2"},
                {"[]", 0, "unknown"},
                {"{\"a\":1}", 0, "{\"a\":1}"}};
  for (const auto& expected : kCases) {
    std::string buffer;
    EXPECT_EQ(numberOf(expected.value), expected.number) << expected.value;
    const std::string_view text = textOf(expected.value, buffer);
    EXPECT_EQ(text, expected.text ? std::string_view(expected.text) : std::string_view("a\0\"b\n", 5));
  }
  std::string buffer;
  const std::string value = "\"" + std::string(159, 'x') + "éé\"";
  EXPECT_EQ(textOf(value, buffer), std::string(159, 'x')) << "cut within a character";
}

}  // namespace
}  // namespace tal::talctl
