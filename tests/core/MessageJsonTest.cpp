#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <string>

#include "core/MessageJson.h"

namespace tal {
namespace {

std::string json(const MessageValue& value) {
  std::string out;
  EXPECT_TRUE(appendJson(out, value));
  return out;
}

struct ValueCase {
  std::string name;
  MessageValue value;
  std::string expected;
};

class JsonOfValue : public testing::TestWithParam<ValueCase> {};

TEST_P(JsonOfValue, IsExact) { EXPECT_EQ(json(GetParam().value), GetParam().expected); }

INSTANTIATE_TEST_SUITE_P(
    Kinds, JsonOfValue,
    testing::Values(
        ValueCase{"Zero", 0, "0"}, ValueCase{"Negative", -7, "-7"},
        ValueCase{"LeastSigned", std::numeric_limits<std::int64_t>::min(), "-9223372036854775808"},
        ValueCase{"MostSignedAsUnsigned", std::uint64_t{1} << 63, "9223372036854775808"},
        ValueCase{"MostUnsigned", std::numeric_limits<std::uint64_t>::max(), "18446744073709551615"},
        ValueCase{"True", true, "true"}, ValueCase{"False", false, "false"},
        ValueCase{"WholeDouble", 44100.0, "44100.0"}, ValueCase{"DoubleZero", 0.0, "0.0"},
        ValueCase{"NegativeZero", -0.0, "-0.0"}, ValueCase{"Shortest", 0.1, "0.1"},
        ValueCase{"LongFraction", 1.0 / 3, "0.3333333333333333"},
        ValueCase{"Timestamp", 1769870702.123456, "1769870702.123456"},
        ValueCase{"UnderQuickWhole", 999999999999999.0, "999999999999999.0"},
        ValueCase{"NoExponentYet", 123456789012345683968.0, "123456789012345683968.0"},
        ValueCase{"LargeExponent", 1e22, "1e+22"}, ValueCase{"SmallExponent", 5e-324, "5e-324"},
        ValueCase{"NotANumber", std::nan(""), "null"},
        ValueCase{"Infinity", -std::numeric_limits<double>::infinity(), "null"},
        ValueCase{"Date", MessageDate{1769870702.123456}, "\"2026-01-31T14:45:02.123456Z\""},
        ValueCase{"Data", MessageData{std::string("\x00\xff\x10", 3)}, "\"AP8Q\""},
        ValueCase{"Array", MessageArray{1, "two", MessageArray{}}, "[1,\"two\",[]]"},
        ValueCase{"Dict", MessageDict{{"b", 1}, {"a", MessageDict{}}}, "{\"b\":1,\"a\":{}}"}),
    [](const auto& row) { return row.param.name; });

struct TextCase {
  std::string name, text, expected;
};

class JsonOfText : public testing::TestWithParam<TextCase> {};

// At every offset, so that the special byte meets each place of a machine word
// and of the tail behind the last one.
TEST_P(JsonOfText, IsTheSameWhereverItStands) {
  for (std::size_t before = 0; before <= 17; ++before) {
    for (std::size_t behind = 0; behind <= 17; ++behind) {
      const std::string head(before, 'x');
      const std::string tail(behind, '~');
      ASSERT_EQ(json(head + GetParam().text + tail), '"' + head + GetParam().expected + tail + '"')
          << before << " before, " << behind << " behind";
    }
  }
}

INSTANTIATE_TEST_SUITE_P(
    Texts, JsonOfText,
    testing::Values(TextCase{"Empty", "", ""}, TextCase{"Quote", "\"", "\\\""},
                    TextCase{"Backslash", "\\", "\\\\"}, TextCase{"NeighboursOfTheQuote", "!#[]", "!#[]"},
                    TextCase{"LineEnd", "\n", "\\n"}, TextCase{"Nul", std::string(1, '\0'), "\\u0000"},
                    TextCase{"Escape", "\x1b", "\\u001b"}, TextCase{"UnitSeparator", "\x1f", "\\u001f"},
                    TextCase{"Blank", " ", " "}, TextCase{"Delete", "\x7f", "\x7f"},
                    TextCase{"TwoBytes", "é", "é"}, TextCase{"FourBytes", "🎵", "🎵"},
                    TextCase{"BareContinuation", "\x80", "\xEF\xBF\xBD"},
                    TextCase{"Surrogate", "\xed\xa0\x80", "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD"},
                    TextCase{"Mixed", "a\"é\\\n\xff", "a\\\"é\\\\\\n\xEF\xBF\xBD"}),
    [](const auto& row) { return row.param.name; });

TEST(MessageJsonTest, LongTextsAndManyKeysAreWhole) {
  const std::string long_text(5000, 'l');
  MessageDict dict;
  std::string expected = "{";
  for (int i = 0; i < 300; ++i) {
    const std::string key = "key\t" + std::to_string(i);
    dict.set(key, i % 7 == 0 ? MessageValue(long_text) : MessageValue(i));
    expected += "\"key\\t" + std::to_string(i) +
                "\":" + (i % 7 == 0 ? '"' + long_text + '"' : std::to_string(i)) + ',';
  }
  expected.back() = '}';
  std::string out = "kept ";
  EXPECT_TRUE(appendJson(out, dict));
  EXPECT_EQ(out, "kept " + expected);
}

TEST(MessageJsonTest, RefusingNonFiniteNumbersLeavesTheTextAlone) {
  MessageArray items;
  for (int i = 0; i < 1000; ++i) items.push_back(MessageValue("enough to be written in several pieces"));
  items.push_back(MessageDict{{"inner", std::nan("")}});
  std::string out = "kept";
  EXPECT_FALSE(appendJson(out, MessageDict{{"items", MessageValue(items)}}, JsonNonFinite::kFail));
  EXPECT_EQ(out, "kept");
  EXPECT_TRUE(appendJson(out, MessageDict{{"fine", 1.5}}, JsonNonFinite::kFail));
  EXPECT_EQ(out, "kept{\"fine\":1.5}");
}

}  // namespace
}  // namespace tal
