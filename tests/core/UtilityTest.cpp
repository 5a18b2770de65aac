#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <thread>
#include <vector>

#include "core/DataSerialize.h"
#include "core/MessageKeys.h"
#include "core/TalReportingSessionMessage.h"
#include "core/TalReportingUtility.h"
#include "core/Utf8.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using Message = TalReportingSessionMessage;

Message::Pointer messageOf(MessageDict dict) {
  return Message::initWithMessage(std::move(dict), AudioEventCategory::kPlayback, AudioEventType::kStart);
}

TEST(Utility, AddDatesOverwritesThreeKeysOfACopy) {
  const MessageDict message{{"a", 1}, {"talreporting_timestamp", "old"}};
  const MessageDict dated = TalReportingUtilityAddDates(message, {1000.5, 41.5, 2'345'678});
  EXPECT_EQ(dated.text(), "{a=1, talreporting_timestamp=1000.5, systemuptime_sec=42, processuptime_ms=2346}");
  EXPECT_EQ(message.text(), "{a=1, talreporting_timestamp=old}");
}

TEST(Utility, RoundWithPlaces) {
  struct Row {
    double value;
    int places;
    double expected;
  };
  for (const Row& row : {Row{2.345, 2, 2.35}, Row{1.005, 2, 1.0}, Row{1234, -2, 1200}, Row{-0.5, 0, -1}}) {
    EXPECT_DOUBLE_EQ(TalReportingUtilityRoundWithPlaces(row.value, row.places), row.expected) << row.value;
  }
}

TEST(Utility, BucketNumberToString) {
  struct Row {
    double number;
    std::vector<double> buckets;
    std::optional<int> digits;
    std::optional<std::string> expected;
  };
  const std::vector<double> volumes(TalReportingUtilityBucketNumberToStringVolumes.begin(),
                                    TalReportingUtilityBucketNumberToStringVolumes.end());
  const std::vector<double> times(TalReportingUtilityBucketNumberToStringTimes.begin(),
                                  TalReportingUtilityBucketNumberToStringTimes.end());
  const std::vector<Row> rows{{7, {0, 5, 10}, 0, "5"},
                              {7.5, {0, 5, 10}, 0, "10"},  // equally near: the later
                              {7, {0, 5, 10}, 1, "5.0"},
                              {7, {}, 1, std::nullopt},
                              {0, {0, 5, 10}, std::nullopt, "0"},
                              {0.2, {0.25, 1}, std::nullopt, "0.25"},
                              {-9, {0, 5}, 0, "0"},
                              {99, {0, 5}, 0, "5"},
                              {1, {0, 10, 1}, 0, "0"},  // ends at the first that lies farther off
                              {0.4, volumes, 4, "0.375"},
                              {0.05, volumes, 4, "0.0625"},
                              {1, volumes, 4, "1.0"},
                              {3.9, times, 0, "5"},
                              {86400 * 9, times, 0, "86400"}};
  for (const Row& row : rows) {
    EXPECT_EQ(TalReportingUtilityBucketNumberToString(row.number, row.buckets, row.digits), row.expected)
        << row.number;
  }
  EXPECT_EQ(volumes.size(), 17U);
  EXPECT_EQ(times.size(), 19U);
}

TEST(Utility, KeyIsPresentAndHasChangedNeedsBothSides) {
  const MessageDict one{{"k", 1}, {"same", 1}};
  const MessageDict two{{"k", 2}, {"same", 1.0}, {"alone", 1}};
  EXPECT_TRUE(TalReportingUtilityKeyIsPresentAndHasChanged("k", &one, &two));
  EXPECT_FALSE(TalReportingUtilityKeyIsPresentAndHasChanged("same", &one, &two));
  EXPECT_FALSE(TalReportingUtilityKeyIsPresentAndHasChanged("alone", &one, &two));
  EXPECT_FALSE(TalReportingUtilityKeyIsPresentAndHasChanged("alone", &two, &one));
  EXPECT_FALSE(TalReportingUtilityKeyIsPresentAndHasChanged("k", &one, nullptr));
}

TEST(Utility, WaitReturnsAtOnceWhenSignalledAndLogsATimeout) {
  test::RecordingLogSink sink;
  const LogChannels log(&sink, LogLevel::kDebug);
  TalReportingCondition condition;
  EXPECT_FALSE(TalReportingUtilityWait(condition, 0, "waiting", "timed out", log.session));
  EXPECT_EQ(sink.count("waiting"), 1U);
  EXPECT_EQ(sink.count("timed out"), 1U);
  sink.lines.clear();

  std::thread other([&condition] { TalReportingUtilitySignal(condition); });
  EXPECT_TRUE(TalReportingUtilityWait(condition, 60, "waiting", "timed out", log.session));
  other.join();
  sink.lines.clear();
  EXPECT_TRUE(TalReportingUtilityWait(condition, 0, "waiting", "timed out", log.session));
  EXPECT_TRUE(sink.lines.empty());
}

TEST(Log, PrefixIsTheFileInTwentyFiveColumnsAndALineThatIsOffCostsNoArguments) {
  struct Sink final : LogSink {
    void write(std::string_view channel, LogLevel, std::string_view line) override {
      lines.push_back(std::string(channel) + '|' + std::string(line));
    }
    std::vector<std::string> lines;
  } sink;
  const LogChannels log(&sink, LogLevel::kDefault);
  log.service.write(LogLevel::kDefault, "src/service/TalReportingService.cpp", 123, "stopping ", -4, ' ', 0.5,
                    true);
  EXPECT_THAT(sink.lines, ElementsAre("talrs|      TalReportingService:123   stopping -4 0.5000001"));
  log.session.write(LogLevel::kError, "TalReportingSession.intake.cpp", 7, "x");
  EXPECT_EQ(sink.lines.back(), "talrr|      TalReportingSession:7     x");
  int built = 0;
  TAL_LOG_DEBUG(log.session, ++built);
  TAL_LOG_INFO(LogChannels(nullptr).session, ++built);
  EXPECT_EQ(built, 0);
  TAL_LOG_ERROR(log.session, ++built);
  EXPECT_EQ(built, 1);
}

TEST(SessionMessage, HasKeysOfItsOwnAndSharesWhatIsInside) {
  MessageDict source{{"inner", MessageDict{}}};
  const auto record = messageOf(source);
  source.set("new", 1);
  const_cast<MessageValue*>(source.find("inner"))->dict()->set("k", 1);
  EXPECT_EQ(record->description(), "category=Playback type=Start {inner={k=1}}");
}

TEST(SessionMessage, CopyIsDeepAndGoesToAllWorkers) {
  const test::TestPlatform host;
  const auto record = messageOf({{"inner", MessageDict{}}});
  record->setIsRedundant(true);
  record->setIsSessionStarted(true);
  record->setDestinationWorkers({nullptr});
  const auto copy = record->copy(host.channels.session);
  const_cast<MessageValue*>(record->message().find("inner"))->dict()->set("k", 1);
  EXPECT_EQ(copy->message().text(), "{inner={}}");
  EXPECT_TRUE(copy->isRedundant() && copy->isSessionStarted());
  EXPECT_EQ(copy->category(), AudioEventCategory::kPlayback);
  EXPECT_TRUE(copy->destinationWorkers().empty());
  EXPECT_EQ(host.log.count("copyWithZone"), 1U);
}

TEST(SessionMessage, SortsStablyByStampWithTheUnstampedFirst) {
  const auto stamped = [](double time, int number) {
    return messageOf({{"talreporting_timestamp", time}, {"n", number}});
  };
  std::vector<Message::Pointer> messages{stamped(5, 1), messageOf({{"n", 2}}), stamped(5, 3), stamped(1, 4)};
  Message::sortMessages(messages);
  std::vector<std::string> order;
  for (const auto& message : messages) order.push_back(message->message().find("n")->text());
  EXPECT_THAT(order, ElementsAre("2", "4", "1", "3"));
}

TEST(DataSerialize, WritesEveryKindAsAPropertyList) {
  const MessageValue value(MessageDict{{"text & <more>", "caf\xC3\xA9"},
                                       {"list", MessageArray{1, 2.5, true, MessageData{"abcd"}}},
                                       {"when", MessageDate{0.75}},
                                       {"none", MessageDict{}}});
  const std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
      "\t<key>text &amp; &lt;more&gt;</key>\n\t<string>caf\xC3\xA9</string>\n"
      "\t<key>list</key>\n\t<array>\n\t\t<integer>1</integer>\n\t\t<real>2.5</real>\n\t\t<true/>\n"
      "\t\t<data>YWJjZA==</data>\n\t</array>\n"
      "\t<key>when</key>\n\t<date>1970-01-01T00:00:00Z</date>\n\t<key>none</key>\n\t<dict/>\n</dict>\n</"
      "plist>\n";
  EXPECT_EQ(DataSerialize::getDataXMLInfo(value), xml);
  EXPECT_EQ(DataSerialize::getPlistBlob(value)->bytes, xml);
  EXPECT_EQ(DataSerialize::getXMLInfo(value), std::nullopt) << "not ASCII";
  EXPECT_THAT(*DataSerialize::getXMLInfo(1), HasSubstr("<integer>1</integer>"));
  EXPECT_EQ(DataSerialize::getBase64XMLBlob("x")->find('\n'), std::string::npos);
  for (const std::string& bad : {std::string("\x01"), std::string("\0", 1), std::string("\xFF")}) {
    EXPECT_EQ(DataSerialize::getPlistBlob(bad), std::nullopt);
  }
}

TEST(Utf8, AcceptsWellFormedTextAlone) {
  for (const std::string good :
       {"", "plain ascii of more than eight bytes", "\xC3\xA9", "\xE2\x82\xAC", "\xED\x9F\xBF",
        "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF", "eight by\xC3\xA9tes"}) {
    EXPECT_TRUE(isUtf8(good)) << good;
  }
  for (const std::string bad :
       {"\x80", "\xC0\xAF", "\xC1\xBF", "\xC3", "\xE0\x9F\xBF", "\xED\xA0\x80", "\xE2\x82",
        "\xF0\x8F\xBF\xBF", "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "eight by\xC3", "\xC3("}) {
    EXPECT_FALSE(isUtf8(bad)) << bad;
  }
}

}  // namespace
}  // namespace tal
