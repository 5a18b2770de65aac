#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "tools/talctl/EventText.h"
#include "tools/talctl/TextLayout.h"

namespace tal::talctl {
namespace {

using testing::ElementsAre;

TEST(Escaping, LeavesNothingThatATerminalObeys) {
  const struct {
    std::string text;
    std::string expected;
  } rows[] = {
      {"plain täxt 音", "plain täxt 音"},
      {"a\nb\tc", "a\\u000ab\\u0009c"},
      {"\033[2J", "\\u001b[2J"},
      {std::string("\0", 1), "\\u0000"},
      {"\x7f", "\\u007f"},
      {"\xc2\x9b"
       "31m",
       "\\u009b31m"},  // the one-character form of ESC [
      {"\xe2\x80\xae"
       "gpj",
       "\\u202egpj"},                             // right-to-left override
      {"\xff\xc3", "\\u00ff\\u00c3"},             // no UTF-8, and cut short
      {"\xed\xa0\x80", "\\u00ed\\u00a0\\u0080"},  // a surrogate
  };
  for (const auto& row : rows) EXPECT_EQ(escapeControls(row.text), row.expected);
}

TEST(Width, CountsColumnsNotBytes) {
  EXPECT_EQ(displayWidth("abc"), 3U);
  EXPECT_EQ(displayWidth("äöü"), 3U);
  EXPECT_EQ(displayWidth("音楽"), 4U);
  EXPECT_EQ(displayWidth("e\xcc\x81"), 1U);  // with a combining accent
  EXPECT_EQ(displayWidth("🎵"), 2U);
}

TEST(Width, IsKeptByCutting) {
  EXPECT_EQ(cutToWidth("abcdef", 6), "abcdef");
  EXPECT_EQ(cutToWidth("abcdef", 5), "abcd…");
  EXPECT_EQ(cutToWidth("abcdef", 1), "…");
  EXPECT_EQ(cutToWidth("音楽音楽", 4), "音…");
  EXPECT_EQ(cutToWidth("音楽", 2), "…");
}

TEST(Wrapping, KeepsWordsWholeWhereItCan) {
  EXPECT_THAT(wrapWords({"aa", "bb", "cc"}, 5), ElementsAre("aa bb", "cc"));
  EXPECT_THAT(wrapWords({"aa", "bb"}, 4), ElementsAre("aa", "bb"));
  EXPECT_THAT(wrapWords({"a", "bcdefgh", "i"}, 3), ElementsAre("a", "bcd", "efg", "h i"));
  EXPECT_THAT(wrapWords({"音楽"}, 3), ElementsAre("音", "楽"));
  EXPECT_THAT(wrapWords({"音楽"}, 1), ElementsAre("音", "楽"));  // too narrow for either: no endless loop
  EXPECT_THAT(wrapWords({"aa", "bb"}, std::nullopt), ElementsAre("aa bb"));
  EXPECT_THAT(wrapWords({}, 5), ElementsAre());
}

TEST(Table, IsAsWideAsItsCells) {
  Table table({"KEY", "VALUE"});
  table.addRow({"device", "a"});
  table.addRow({"x", "long text\n"});
  const std::string expected =
      "KEY     VALUE\n"
      "device  a\n"
      "x       long text\\u000a\n";
  EXPECT_EQ(table.text(std::nullopt), expected);
  EXPECT_EQ(table.text(23), expected);
}

TEST(Table, CutsItsWidestColumnsToFit) {
  Table table({"A", "B", "C"});
  table.addRow({"1", "bbbbbbbbbb", "cccccccc"});
  EXPECT_EQ(table.text(17),
            "A  B       C\n"
            "1  bbbbb…  ccccc…\n");
  EXPECT_EQ(table.text(3), "A  B  C\n1  …  …\n") << "no narrower than a column each";
}

constexpr const char* kPayload =
    R"({"on":true,"volume":1.0,"text":"a \u001b[31m\n","nested":{"z":[18446744073709551615]},"odd key":null})";

TEST(EventText, IsOneLineForPrograms) {
  const Terminal pipe(false, false);
  const std::string text = eventText({7, 1769870702.25, "org.vantle.talsys.Playback.Start", kPayload}, pipe);
  // The time is in whatever zone the machine is in.
  ASSERT_GT(text.size(), 23U);
  EXPECT_EQ(text.substr(19, 4), ".250");
  EXPECT_EQ(text.substr(23),
            "  org.vantle.talsys.Playback.Start  on=true volume=1.0 text=\"a \\u001b[31m\\n\" "
            "nested={\"z\":[18446744073709551615]} \"odd key\"=null\n");
}

TEST(EventJson, KeepsThePayloadAndItsTypes) {
  EXPECT_EQ(eventJson({7, 1769870702.25, "a.b", kPayload}),
            std::string(R"({"id":7,"recorded_at":1769870702.25,"name":"a.b","payload":)") + kPayload + "}\n");
}

TEST(EventJson, PassesOnAPayloadThatIsNoJsonAsText) {
  EXPECT_EQ(eventJson({1, 2, "n", "not { json"}),
            "{\"id\":1,\"recorded_at\":2.0,\"name\":\"n\",\"payload\":\"not { json\"}\n");
}

}  // namespace
}  // namespace tal::talctl
