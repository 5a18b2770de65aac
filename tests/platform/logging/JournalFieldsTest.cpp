#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/linux/logging/JournalLogSink.h"

namespace tal {
namespace {

using testing::Contains;
using testing::ElementsAre;

TEST(JournalFieldsTest, NameWhatTheLineHolds) {
  EXPECT_THAT(journalFields("talrs", LogLevel::kError, "      TalReportingService:123   lost\ncontact"),
              ElementsAre("MESSAGE=      TalReportingService:123   lost\\ncontact", "PRIORITY=3",
                          "SYSLOG_IDENTIFIER=talreportingd", "TAL_CHANNEL=talrs",
                          "CODE_FILE=TalReportingService", "CODE_LINE=123"));
}

TEST(JournalFieldsTest, LinesWithoutAPrefixHaveNoSource) {
  for (const std::string_view line : {"", "   ", "plain text", ":12 text", "name: text", "name:1a text"}) {
    EXPECT_EQ(journalFields("talrs", LogLevel::kInfo, line).size(), 4U) << line;
  }
}

TEST(JournalFieldsTest, LevelsBecomeSyslogPriorities) {
  EXPECT_THAT(journalFields("c", LogLevel::kDefault, ""), Contains("PRIORITY=5"));
  EXPECT_THAT(journalFields("c", LogLevel::kInfo, ""), Contains("PRIORITY=6"));
  EXPECT_THAT(journalFields("c", LogLevel::kDebug, ""), Contains("PRIORITY=7"));
}

}  // namespace
}  // namespace tal
