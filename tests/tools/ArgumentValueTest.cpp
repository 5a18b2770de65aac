#include <gtest/gtest.h>

#include <limits>
#include <ostream>
#include <string>

#include "tools/talctl/ArgumentValue.h"
#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

struct ValueCase {
  std::string name;
  std::string text;
  Json expected;
};

void PrintTo(const ValueCase& row, std::ostream* out) { *out << row.text; }

class ArgumentValue : public testing::TestWithParam<ValueCase> {};

TEST_P(ArgumentValue, HasItsKindAndContent) {
  const Json value = parseValue(GetParam().text);
  EXPECT_EQ(value, GetParam().expected);
  // Json calls 1 and 1.0 equal; a message does not keep them alike.
  EXPECT_STREQ(value.type_name(), GetParam().expected.type_name());
  EXPECT_EQ(value.is_number_float(), GetParam().expected.is_number_float());
}

INSTANTIATE_TEST_SUITE_P(
    Kinds, ArgumentValue,
    testing::Values(
        ValueCase{"Integer", "1", 1U}, ValueCase{"NegativeInteger", "-1", -1}, ValueCase{"Zero", "0", 0U},
        ValueCase{"MostUnsigned", "18446744073709551615", std::numeric_limits<std::uint64_t>::max()},
        ValueCase{"LeastSigned", "-9223372036854775808", std::numeric_limits<std::int64_t>::min()},
        ValueCase{"Double", "1.5", 1.5}, ValueCase{"WholeDouble", "1.0", 1.0},
        ValueCase{"Exponent", "1e3", 1000.0}, ValueCase{"True", "true", true},
        ValueCase{"False", "false", false}, ValueCase{"QuotedText", R"("true")", "true"},
        ValueCase{"QuotedEscapes", R"("a\nb")", "a\nb"}, ValueCase{"EmptyText", "", ""},
        ValueCase{"BareWord", "speaker", "speaker"},
        ValueCase{"BareWords", "Built-in Audio", "Built-in Audio"},
        ValueCase{"WordThatStartsWithDigit", "10m", "10m"}, ValueCase{"Date", "2026-01-31", "2026-01-31"},
        ValueCase{"LeadingZero", "007", "007"}, ValueCase{"Minus", "-", "-"},
        ValueCase{"NumberAndBlank", "1 ", "1 "}, ValueCase{"CapitalTrue", "True", "True"},
        ValueCase{"Object", R"({"a":{"b":[1]}})", Json({{"a", {{"b", {1U}}}}})},
        ValueCase{"Array", "[1, true]", Json::array({1U, true})}),
    [](const auto& row) { return row.param.name; });

TEST(ArgumentValue, KeepsTheOrderOfKeys) {
  EXPECT_EQ(parseValue(R"({"z": 1, "a": 2})").dump(), R"({"z":1,"a":2})");
}

TEST(ArgumentValue, RefusesWhatItWouldOtherwiseAlter) {
  for (const char* text : {"18446744073709551616", "-9223372036854775809", "1e999", "null", "\"open",
                           "{a: 1}", "[1,", "{\"a\": 1} trailing", "\"\xff\""}) {
    EXPECT_THROW(parseValue(text), UsageError) << text;
  }
}

TEST(KeyValue, IsSplitAtTheFirstEqualsSign) {
  const auto [key, value] = parseKeyValue("a=b=c");
  EXPECT_EQ(key, "a");
  EXPECT_EQ(value, "b=c");
  EXPECT_EQ(parseKeyValue("empty=").second, "");
  for (const char* text : {"", "key", "=1"}) EXPECT_THROW(parseKeyValue(text), UsageError) << text;
}

}  // namespace
}  // namespace tal::talctl
