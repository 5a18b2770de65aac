#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "platform/HostFakes.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/settings/DeviceTomlProperties.h"
#include "platform/linux/settings/TomlSettings.h"

namespace tal {
namespace {

using std::chrono_literals::operator""ms;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

constexpr std::string_view kDomain = "org.vantle.test";

class TomlSettingsTest : public testing::Test {
 protected:
  TomlSettings openSettings() {
    return TomlSettings({.config_directory = directory_.path() / "config",
                         .state_directory = directory_.path() / "state",
                         .clock = clock_,
                         .log = log_.service});
  }
  std::filesystem::path fileOf(std::string_view layer) const {
    return directory_.path() / layer / "settings" / (std::string(kDomain) + ".toml");
  }
  void writeConfig(std::string_view text) { test::writeFile(fileOf("config"), text); }
  void writeState(std::string_view text) { test::writeFile(fileOf("state"), text); }

  test::TemporaryDirectory directory_;
  test::StandingClock clock_;
  test::RecordingLogSink lines_;
  LogChannels log_{&lines_};
  TomlSettings settings_ = openSettings();
};

TEST_F(TomlSettingsTest, WithoutFilesEveryKeyIsAbsent) {
  EXPECT_EQ(settings_.value(kDomain, "key"), std::nullopt);
  EXPECT_THAT(lines_.lines(), IsEmpty());
}

TEST_F(TomlSettingsTest, StateGoesBeforeConfigKeyByKey) {
  writeConfig("both = 'config'\nconfig_only = 1");
  writeState("both = 'state'\nstate_only = 2");
  EXPECT_EQ(settings_.value(kDomain, "both"), MessageValue("state"));
  EXPECT_EQ(settings_.value(kDomain, "config_only"), MessageValue(1));
  EXPECT_EQ(settings_.value(kDomain, "state_only"), MessageValue(2));
  EXPECT_EQ(settings_.value("org.vantle.other", "both"), std::nullopt);
}

TEST_F(TomlSettingsTest, AChangeIsSeenWithinASecondWhateverBecomesOfTheFile) {
  EXPECT_EQ(settings_.value(kDomain, "key"), std::nullopt);
  writeConfig("key = 1");
  clock_.advance(1000ms);
  EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue(1));
  writeConfig("key = 22");
  clock_.advance(1000ms);
  EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue(22));
  test::writeFile(fileOf("config").string() + ".new", "key = 33");
  std::filesystem::rename(fileOf("config").string() + ".new", fileOf("config"));
  clock_.advance(1000ms);
  EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue(33));
  std::filesystem::remove(fileOf("config"));
  clock_.advance(1000ms);
  EXPECT_EQ(settings_.value(kDomain, "key"), std::nullopt);
}

TEST_F(TomlSettingsTest, ARefreshShowsWhatIsWrittenByNowHoweverFastItCame) {
  for (const int value : {1, 2, 3, 4, 5, 6, 7, 8, 9}) {  // of one size, mostly within one tick
    writeConfig("key = " + std::to_string(value));
    settings_.refresh(kDomain);
    ASSERT_EQ(settings_.value(kDomain, "key"), MessageValue(value));
  }
  std::filesystem::remove(fileOf("config"));
  EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue(9)) << "no look so soon without a refresh";
  settings_.refresh(kDomain);
  EXPECT_EQ(settings_.value(kDomain, "key"), std::nullopt);
  settings_.refresh("../escape");
}

TEST_F(TomlSettingsTest, RefreshingABrokenFileSaysNothingNew) {
  writeConfig("not toml");
  for (int look = 0; look < 3; ++look) settings_.refresh(kDomain);
  EXPECT_THAT(lines_.lines(), ElementsAre(HasSubstr("is taken as empty")));
}

TEST_F(TomlSettingsTest, BrokenFileReadsAsEmptyAndIsLoggedOncePerChange) {
  writeConfig("key = 'from config'");
  writeState("fine = 1\nkey = @");
  for (int look = 0; look < 3; ++look) {
    EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue("from config"));
    EXPECT_EQ(settings_.value(kDomain, "fine"), std::nullopt);
    clock_.advance(1000ms);
  }
  EXPECT_THAT(lines_.lines(), ElementsAre(AllOf(HasSubstr("error: "), HasSubstr(fileOf("state").string()),
                                                HasSubstr("line 2, column 7"))));
  writeState("key = = 1");
  clock_.advance(1000ms);
  settings_.value(kDomain, "key");
  EXPECT_THAT(lines_.lines(), ElementsAre(testing::_, HasSubstr("line 1, column 7")));
  writeState("key = 'mended'");
  clock_.advance(1000ms);
  EXPECT_EQ(settings_.value(kDomain, "key"), MessageValue("mended"));
}

TEST_F(TomlSettingsTest, ABrokenFileIsNeverWrittenOver) {
  writeState("not toml");
  EXPECT_FALSE(settings_.setValue(kDomain, "key", 1));
  EXPECT_EQ(test::readFile(fileOf("state")), "not toml");
  EXPECT_THAT(lines_.lines(), testing::Contains(HasSubstr("key was not kept")));
}

TEST_F(TomlSettingsTest, AFileThatCannotBeReadIsNoFileToWriteOver) {
  std::filesystem::create_directories(fileOf("state"));  // a directory in its place
  EXPECT_EQ(settings_.value(kDomain, "key"), std::nullopt);
  EXPECT_FALSE(settings_.setValue(kDomain, "key", 1));
  EXPECT_THAT(lines_.lines(), testing::Contains(HasSubstr("is taken as empty")));
}

TEST_F(TomlSettingsTest, EveryKindOfValueComesBackFromTheFile) {
  const MessageDict values{{"text", "a \"quoted\"\nline é"},
                           {"integer", -9007199254740993},
                           {"whole", 2.0},
                           {"fraction", 0.1},
                           {"truth", true},
                           {"date", MessageDate{1769870702.123456}},
                           {"early date", MessageDate{-1.5}},
                           {"array", MessageArray{1, "two", 3.5, MessageArray{false}}},
                           {"table", MessageDict{{"inner", MessageDict{{"key", 1}}}}}};
  for (const auto& [key, value] : values) ASSERT_TRUE(settings_.setValue(kDomain, key, value)) << key;
  const TomlSettings reopened = openSettings();
  for (const auto& [key, value] : values) {
    const std::optional<MessageValue> read = reopened.value(kDomain, key);
    ASSERT_TRUE(read) << key;
    EXPECT_EQ(read->kind() == MessageValue::Kind::kDate ? MessageValue(read->text()) : *read,
              value.kind() == MessageValue::Kind::kDate ? MessageValue(value.text()) : value)
        << key;
    EXPECT_EQ(read->kind(), value.kind()) << key;
  }
}

TEST_F(TomlSettingsTest, DatesOfAllFormsBecomePointsInTime) {
  writeConfig(
      "offset = 2026-01-31T15:45:02.25+01:00\nlocal = 2026-01-31T14:45:02.25\nday = 2026-01-31\ntime = "
      "14:45:02");
  EXPECT_EQ(settings_.value(kDomain, "offset")->text(), "2026-01-31T14:45:02.250000Z");
  EXPECT_EQ(settings_.value(kDomain, "local")->text(), "2026-01-31T14:45:02.250000Z");
  EXPECT_EQ(settings_.value(kDomain, "day")->text(), "2026-01-31T00:00:00.000000Z");
  EXPECT_EQ(settings_.value(kDomain, "time"), MessageValue("14:45:02"));
}

TEST_F(TomlSettingsTest, WhatTomlCannotHoldIsRefusedAndLeavesTheFileAlone) {
  ASSERT_TRUE(settings_.setValue(kDomain, "kept", 1));
  const std::string before = test::readFile(fileOf("state"));
  EXPECT_FALSE(settings_.setValue(kDomain, "key", MessageData{"bytes"}));
  EXPECT_FALSE(settings_.setValue(kDomain, "key", std::uint64_t{1} << 63));
  EXPECT_FALSE(settings_.setValue(kDomain, "key", "\xff"));
  EXPECT_FALSE(settings_.setValue(kDomain, "key", MessageDate{1e18}));
  EXPECT_FALSE(settings_.setValue("../escape", "key", 1));
  EXPECT_FALSE(settings_.setValue("", "key", 1));
  EXPECT_EQ(test::readFile(fileOf("state")), before);
  EXPECT_EQ(lines_.lines().size(), 6U);
  EXPECT_EQ(settings_.value("../escape", "key"), std::nullopt);
}

TEST_F(TomlSettingsTest, WritingKeepsOtherKeysSeesOthersChangesAndLeavesNoLitter) {
  ASSERT_TRUE(settings_.setValue(kDomain, "mine", 1));
  writeState("theirs = 5\n");  // another program, since the last look
  ASSERT_TRUE(settings_.setValue(kDomain, "mine", 2));
  EXPECT_EQ(settings_.value(kDomain, "mine"), MessageValue(2));
  EXPECT_EQ(settings_.value(kDomain, "theirs"), MessageValue(5));
  const auto folder = fileOf("state").parent_path();
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder), {}), 1);
  struct stat status {};
  ASSERT_EQ(::stat(fileOf("state").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0640U);
  ASSERT_EQ(::stat(folder.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0750U);
}

TEST_F(TomlSettingsTest, AFolderThatCannotBeMadeIsReported) {
  test::writeFile(directory_.path() / "state", "a file where the directory should be");
  EXPECT_FALSE(settings_.setValue(kDomain, "key", 1));
  EXPECT_THAT(lines_.lines(), ElementsAre(HasSubstr("cannot make")));
}

TEST(DeviceTomlPropertiesTest, AnswersFromTheFile) {
  const test::TemporaryDirectory directory;
  test::RecordingLogSink lines;
  const LogChannels log(&lines);
  const DeviceTomlProperties properties(directory.path(), log.service);
  EXPECT_EQ(properties.booleanProperty("InternalBuild"), std::nullopt);
  test::writeFile(directory.path() / "device.toml", "InternalBuild = true\nOptIn = 'yes'\nOther = false");
  EXPECT_EQ(properties.booleanProperty("InternalBuild"), true);
  EXPECT_EQ(properties.booleanProperty("Other"), false);
  EXPECT_EQ(properties.booleanProperty("OptIn"), std::nullopt);
  EXPECT_EQ(properties.booleanProperty("OptIn"), std::nullopt);
  EXPECT_THAT(lines.lines(), ElementsAre(HasSubstr("OptIn is not a boolean")));
}

}  // namespace
}  // namespace tal
