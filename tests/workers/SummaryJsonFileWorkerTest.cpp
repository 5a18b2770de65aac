#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <nlohmann/json.hpp>
#include <random>
#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/sinks/TalReportingSessionSummaryJsonFileWorker.h"

namespace tal {
namespace {

using nlohmann::json;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class SummaryJsonFileWorker : public test::SessionFixture {
 protected:
  void make(AudioServiceType type = AudioServiceType::kTest) {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionSummaryJsonFileWorkerClass>());
    makeSession(std::move(classes));
    session().setServiceType(type);
    session().start();
  }
  TalReportingSessionMessage::Pointer send(MessageDict dict,
                                           AudioEventCategory category = AudioEventCategory::kPlayback) {
    auto message =
        test::messageAt(host.clock.secondsSince1970(), std::move(dict), category, AudioEventType::kStart);
    session().sendMessage(message);
    return message;
  }
  const std::string& theFile() { return host.diagnostic_log.files.begin()->second; }
  std::vector<std::string> entryNames() {
    std::vector<std::string> names;
    for (const auto& entry : json::parse(theFile())) names.push_back(entry.items().begin().key());
    return names;
  }
};

TEST_F(SummaryJsonFileWorker, WritesEachKeptMessageUnderANumberOfItsKind) {
  make();
  session().updateConfigurationWithContentsOfConfiguration(
      MessageDict{{"HostApplicationDisplayID", "my.app"}});
  send({{"n", 1}});
  send({{"n", 1}});  // redundant
  send({{"n", 2}}, AudioEventCategory::kRecord);
  const auto last = send({{"n", 3}, {"text", "a \"quote\""}});
  session().stop();
  ASSERT_EQ(host.diagnostic_log.files.size(), 1U);
  EXPECT_EQ(host.diagnostic_log.files.begin()->first,
            "/log/Audio/Reporting/20240131-154502+0100-7-my.app-test.json");
  EXPECT_THAT(host.diagnostic_log.directories, ElementsAre("Audio/Reporting"));
  EXPECT_THAT(entryNames(), ElementsAre("Setup_Start_1", "Playback_Start_1", "Record_Start_1",
                                        "Playback_Start_2", "Setup_Stop_1"));
  const json file = json::parse(theFile());
  EXPECT_EQ(file[3]["Playback_Start_2"]["text"], "a \"quote\"");
  EXPECT_EQ(file[3]["Playback_Start_2"]["isSessionStarted"], "YES");
  EXPECT_EQ(file[0]["Setup_Start_1"]["isSessionStarted"], "NO");
  EXPECT_EQ(last->message().find("isSessionStarted")->text(), "YES") << "the record itself is extended";
  EXPECT_TRUE(theFile().starts_with("[\n{\n") && theFile().ends_with("\n}\n]\n"));
}

TEST_F(SummaryJsonFileWorker, ExistsOnInternalBuildsAndForTestSessions) {
  make(AudioServiceType::kAlarms);
  EXPECT_EQ(session().workerInstanceCount(), 0U);
  host.platform.internal_build = true;
  make(AudioServiceType::kAlarms);
  EXPECT_EQ(session().workerInstanceCount(), 1U);
}

TEST_F(SummaryJsonFileWorker, WritesOneFileForEachStopAndCountsAnew) {
  make();
  send({{"n", 1}});
  session().stop();
  host.diagnostic_log.files.clear();
  session().start();
  session().stop();
  EXPECT_THAT(entryNames(), ElementsAre("Setup_Start_1", "Setup_Stop_1"));
}

TEST_F(SummaryJsonFileWorker, NumberThatJsonLacksFailsItsEntryAlone) {
  make();
  send({{"bad", std::nan("")}});
  send({{"n", 1}}, AudioEventCategory::kRecord);
  session().stop();
  EXPECT_TRUE(host.log.holds("dataWithJSONObject: Playback_Start_1"));
  EXPECT_NE(theFile().find("\n,\n,\n"), std::string::npos) << "the comma stays";
  EXPECT_NE(theFile().find("Record_Start_1"), std::string::npos);
}

TEST_F(SummaryJsonFileWorker, FailuresAreLoggedAndLeaveTheSessionAlone) {
  make();
  host.diagnostic_log.directory_error = "read-only";
  host.diagnostic_log.open_error = "no space";
  session().stop();
  EXPECT_EQ(host.log.count("can't create logging directory at /log/Audio/Reporting: read-only"), 1U);
  EXPECT_TRUE(
      host.log.holds("failed to open file. action=open file=/log/Audio/Reporting/20240131-154502+0100-7-"));
  host.diagnostic_log.open_error.reset();
  host.diagnostic_log.write_error = "disk full";
  host.diagnostic_log.close_error = "disk really full";
  session().start();
  session().stop();
  EXPECT_TRUE(host.log.holds("failed to write line. action=writeline"));
  EXPECT_TRUE(host.log.holds("failed to closed file. action=close"));
  EXPECT_THAT(theFile(), IsEmpty());
}

// Files of random finite values parse, and hold each message once.
TEST_F(SummaryJsonFileWorker, RandomSessionsParseWithAnotherReader) {
  std::mt19937 random(53);
  const auto randomValue = [&random]() -> MessageValue {
    switch (random() % 7) {
      case 0:
        return static_cast<std::int64_t>(random()) - (std::int64_t{1} << 31);
      case 1:
        return std::ldexp(static_cast<double>(random()), static_cast<int>(random() % 200) - 100);
      case 2: {
        std::string text;
        for (std::size_t i = random() % 20; i > 0; --i) text += static_cast<char>(random() % 128);
        return text;
      }
      case 3:
        return MessageDate{static_cast<double>(random())};
      case 4:
        return MessageData{std::string(random() % 9, '\xFE')};
      case 5:
        return MessageArray{random() % 2 == 0, MessageDict{{"k", "\xE2\x82\xAC"}}};
      default:
        return random() % 2 == 0;
    }
  };
  for (int round = 0; round < 50; ++round) {
    host.diagnostic_log.files.clear();
    make();
    const std::size_t count = random() % 20;
    for (std::size_t i = 0; i < count; ++i) send({{"number", i}, {"value", randomValue()}});
    session().stop();
    std::size_t next = 0;
    for (const auto& entry : json::parse(theFile())) {
      const auto& message = *entry.begin();
      if (message.contains("number")) {
        ASSERT_EQ(message["number"], next++);
      }
    }
    ASSERT_EQ(next, count);
  }
}

}  // namespace
}  // namespace tal
