#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "core/MessageDict.h"
#include "core/MessageValue.h"

namespace tal {
namespace {

constexpr auto kMostSigned = std::numeric_limits<std::int64_t>::max();
constexpr auto kMostUnsigned = std::numeric_limits<std::uint64_t>::max();

TEST(MessageValue, NumbersOfAnyKindAreEqualWhenTheirValuesAre) {
  const std::vector<std::pair<MessageValue, MessageValue>> equal{
      {1, 1U},     {1, 1.0},
      {true, 1},   {false, 0.0},
      {-3, -3.0},  {kMostSigned, static_cast<std::uint64_t>(kMostSigned)},
      {0.0, -0.0}, {std::uint64_t{1} << 63, 0x1p63}};
  for (const auto& [a, b] : equal) {
    EXPECT_TRUE(a == b && b == a) << a.text() << " and " << b.text();
  }
  const std::vector<std::pair<MessageValue, MessageValue>> different{
      {1, 2},
      {-1, kMostUnsigned},    // the same bits
      {kMostSigned, 0x1p63},  // equal once rounded to double
      {kMostUnsigned, 0x1p64},
      {1, "1"},
      {std::nan(""), std::nan("")},
      {1.0, MessageDate{1.0}},
      {"a", MessageData{"a"}},
      {0.5, 0}};
  for (const auto& [a, b] : different) {
    EXPECT_FALSE(a == b || b == a) << a.text() << " and " << b.text();
  }
}

TEST(MessageValue, TextOfAnyLengthAndOriginIsTheSameText) {
  for (const std::string text :
       {"", "fourteen bytes", "fifteen bytes !", "a text that is longer than any inline one"}) {
    const MessageValue value(text);
    MessageValue copy = value;
    MessageValue moved = std::move(copy);
    EXPECT_EQ(moved.string(), text);
    EXPECT_EQ(moved, MessageValue::literal(text));
    EXPECT_EQ(copy.string(), "");  // NOLINT(bugprone-use-after-move)
    copy = moved;
    copy = *&copy;
    EXPECT_EQ(copy, value);
  }
}

TEST(MessageValue, TextFormOfEveryKind) {
  const std::vector<std::pair<MessageValue, std::string>> rows{
      {"as it is", "as it is"},
      {-7, "-7"},
      {kMostUnsigned, "18446744073709551615"},
      {0.1, "0.1"},
      {48000.0, "48000"},
      {std::copysign(std::nan(""), -1.0), "nan"},
      {true, "1"},
      {false, "0"},
      {MessageDate{1769870702.123456}, "2026-01-31T14:45:02.123456Z"},
      {MessageDate{-0.5}, "1969-12-31T23:59:59.500000Z"},
      {MessageDate{1e300}, "9999-12-31T23:59:59.000000Z"},
      {MessageData{std::string("\x00\xff", 2)}, "00ff"},
      {MessageArray{1, "b"}, "[1, b]"},
      {MessageDict{{"k", 1}, {"l", MessageArray{}}}, "{k=1, l=[]}"}};
  for (const auto& [value, text] : rows) EXPECT_EQ(value.text(), text);
}

TEST(MessageValue, ConversionsHoldTheRange) {
  EXPECT_EQ(MessageValue(1e300).toInt64(), kMostSigned);
  EXPECT_EQ(MessageValue(-1e300).toInt64(), std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(MessageValue(std::nan("")).toInt64(), 0);
  EXPECT_EQ(MessageValue(kMostUnsigned).toInt64(), kMostSigned);
  EXPECT_EQ(MessageValue(-2.9).toInt64(), -2);
  EXPECT_EQ(MessageValue("9007199254740993").toInt64(), 9007199254740993);
  EXPECT_DOUBLE_EQ(MessageValue("2.5 dB").toDouble(), 2.5);
  EXPECT_TRUE(MessageValue("YES").toBool());
  EXPECT_FALSE(MessageValue("0").toBool());
  EXPECT_FALSE(MessageValue(MessageArray{1}).toBool());
}

TEST(MessageValue, CopyOfAContainerIsSharedAndDeepCopyIsNot) {
  MessageValue original(MessageDict{{"list", MessageArray{1}}});
  MessageValue shared = original;
  MessageValue own = original.deepCopy();
  original.dict()->set("added", 1);
  const_cast<MessageValue*>(original.dict()->find("list"))->array()->push_back(2);
  EXPECT_TRUE(shared.dict()->contains("added"));
  EXPECT_EQ(shared.dict()->find("list")->array()->size(), 2U);
  EXPECT_FALSE(own.dict()->contains("added"));
  EXPECT_EQ(own.dict()->find("list")->array()->size(), 1U);
}

}  // namespace
}  // namespace tal
