#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "support/TestPlatform.h"
#include "system/TalReportingSystemMonitor.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

constexpr std::string_view kSpatial = "spatial-audio-accessory-feature";
constexpr std::string_view kSpatialChanged = "org.vantle.homeshell.spatial-audio-accessory-feature.changed";
constexpr std::string_view kRinger = "org.vantle.homeshell.ringerstate";
constexpr std::string_view kOwn = "org.vantle.talsys.reporting";

class SystemMonitor : public testing::Test {
 protected:
  void initialize() { monitor.initializeWithQueue(host.queue); }
  void set(std::string_view domain, std::string_view key, const MessageValue& value) {
    host.settings.setValue(domain, key, value);
  }
  void post(std::string_view name, std::optional<std::uint64_t> state = std::nullopt) {
    host.notify_center.post(name, state);
    host.queue.runUntilIdle();
  }
  /// "-" for a feature without a state.
  std::string filed(std::string_view feature) {
    const auto state = monitor.getSystemMonitorDictionary()->stateOf(feature);
    return state ? state->text() : "-";
  }

  test::TestPlatform host;
  TalReportingSystemMonitor monitor{host.platform};
};

TEST_F(SystemMonitor, WithoutSettingsNoFeatureHasAState) {
  initialize();
  EXPECT_THAT(monitor.getSystemMonitorKeys(), ElementsAre(kSpatial, "device_name", "ringerstate"));
  for (const std::string& feature : monitor.getSystemMonitorKeys()) EXPECT_EQ(filed(feature), "-");
  EXPECT_EQ(monitor.getDefaults().text(), "{disable_reporting=0}");
  EXPECT_EQ(monitor.getDefaults().find("disable_reporting")->kind(), MessageValue::Kind::kSigned);
}

TEST_F(SystemMonitor, ReadsSettingsAsTheyAreStoredAndTheRingerNotYet) {
  host.clock.setWall(1000.25);
  host.clock.uptime_seconds = 41.5;
  set("org.vantle.homeshell", kSpatial, MessageArray{1, "two"});
  set("org.vantle.talsys", "device_name", "kitchen");
  set("org.vantle.talsys", "disable_reporting", "yes");
  host.notify_center.states[std::string(kRinger)] = 1;
  initialize();
  EXPECT_EQ(
      filed(kSpatial),
      "{spatial-audio-accessory-feature=[1, two], talreporting_timestamp=1000.25, systemuptime_sec=42}");
  EXPECT_EQ(filed("device_name"),
            "{device_name=kitchen, talreporting_timestamp=1000.25, systemuptime_sec=42}");
  EXPECT_EQ(filed("ringerstate"), "-") << "its state is known, but nobody has posted it";
  EXPECT_EQ(monitor.getDefaults().text(), "{device_name=kitchen, disable_reporting=1}");
  EXPECT_EQ(monitor.getDefaults().find("disable_reporting")->kind(), MessageValue::Kind::kBoolean);
}

TEST_F(SystemMonitor, RingerIsOnForOneAloneFromTheFirstPostOn) {
  initialize();
  const std::vector<std::pair<std::uint64_t, bool>> rows{
      {0, false}, {1, true}, {2, false}, {~std::uint64_t{0}, false}, {1, true}};
  for (const auto& [state, is_on] : rows) {
    post(kRinger, state);
    const auto filed_state = monitor.getSystemMonitorDictionary()->stateOf("ringerstate");
    ASSERT_TRUE(filed_state) << state;
    EXPECT_EQ(filed_state->find("ringerstate")->kind(), MessageValue::Kind::kBoolean);
    EXPECT_EQ(filed_state->find("ringerstate")->toBool(), is_on) << state;
  }
}

TEST_F(SystemMonitor, APostReadsItsOwnFeatureAnewAndFreshFromTheFiles) {
  initialize();
  set("org.vantle.homeshell", kSpatial, true);
  set("org.vantle.talsys", "device_name", "hall");
  host.settings.refreshed.clear();
  post(kOwn);
  EXPECT_THAT(filed("device_name"), HasSubstr("device_name=hall"));
  EXPECT_EQ(filed(kSpatial), "-");
  EXPECT_THAT(host.settings.refreshed, ElementsAre("org.vantle.talsys"));
  post(kSpatialChanged);
  EXPECT_THAT(filed(kSpatial), HasSubstr("{spatial-audio-accessory-feature=1, "));
  EXPECT_EQ(monitor.getDefaults().text(), "{disable_reporting=0}") << "read once";
  EXPECT_EQ(monitor.TalReportingDefaults().text(), "{device_name=hall, disable_reporting=0}");
}

TEST_F(SystemMonitor, AFeatureThatDoesNotReadKeepsItsState) {
  set("org.vantle.talsys", "device_name", "hall");
  initialize();
  post(kRinger, 1);
  const std::string name = filed("device_name");
  const std::string ringer = filed("ringerstate");
  host.clock.advance(std::chrono::seconds(1));
  host.settings.values.clear();
  host.notify_center.states_fail = true;
  post(kOwn);
  post(kRinger, 0);
  EXPECT_EQ(filed("device_name"), name);
  EXPECT_EQ(filed("ringerstate"), ringer);
  EXPECT_EQ(monitor.getFeatureState("device_name"), std::nullopt);
  EXPECT_EQ(monitor.getFeatureState("no such feature"), std::nullopt);
  EXPECT_EQ(monitor.getFeatureState(""), std::nullopt);
}

TEST_F(SystemMonitor, FilesNothingThatEqualsWhatIsFiled) {
  set("org.vantle.talsys", "device_name", "hall");
  initialize();
  int told = 0;
  const auto observation =
      monitor.getSystemMonitorDictionary()->observe("device_name", [&told](const MessageDict&) { ++told; });
  post(kOwn);
  EXPECT_EQ(told, 0) << "the very same moment";
  host.clock.advance(std::chrono::seconds(1));
  post(kOwn);
  EXPECT_EQ(told, 1) << "the same name, read anew";
  EXPECT_EQ(host.log.count("Updating value featureName=device_name"), 1U);
}

TEST_F(SystemMonitor, SaysWhatItDoes) {
  initialize();
  std::vector<std::string> lines;
  for (const auto& line : host.log.lines)
    lines.push_back(std::string(logLevelName(line.level)) + ' ' + line.text);
  const std::string features =
      "{spatial-audio-accessory-feature={defaults_domain=org.vantle.homeshell, "
      "notification=org.vantle.homeshell.spatial-audio-accessory-feature.changed, "
      "feature_domain=spatial-audio-accessory-feature}, "
      "device_name={defaults_domain=org.vantle.talsys, notification=org.vantle.talsys.reporting, "
      "feature_domain=device_name}, "
      "ringerstate={notification=org.vantle.homeshell.ringerstate, feature_domain=ringerstate}}";
  EXPECT_THAT(lines,
              ElementsAre("info populateInitialValues " + features,
                          "default getting feature spatial-audio-accessory-feature",
                          "default getting feature device_name", "default getting feature ringerstate",
                          "info listening for features " + features, "default notify setup result 0 token 1",
                          "default notify setup result 0 token 2", "default notify setup result 0 token 3"));
  post(kRinger, 1);
  EXPECT_EQ(host.log.count("feature changes featureName=ringerstate token=3"), 1U);
}

TEST_F(SystemMonitor, FailedRegistrationsAreLoggedAndOtherwiseIgnored) {
  host.notify_center.registrations_fail = true;
  set("org.vantle.talsys", "device_name", "hall");
  initialize();
  EXPECT_EQ(host.log.count("notify setup result 3 token -1"), 3U);
  EXPECT_THAT(filed("device_name"), HasSubstr("hall"));
  EXPECT_EQ(monitor.getFeatureState("ringerstate"), std::nullopt);
}

TEST_F(SystemMonitor, ASecondInitializationChangesNothing) {
  initialize();
  const auto dictionary = monitor.getSystemMonitorDictionary();
  test::HandQueue other(host.clock);
  monitor.initializeWithQueue(other);
  EXPECT_EQ(monitor.getSystemMonitorDictionary(), dictionary);
  EXPECT_EQ(host.notify_center.watchers.size(), 3U);
}

TEST_F(SystemMonitor, ClearListensNoMoreButKeepsTheStates) {
  initialize();
  post(kRinger, 1);
  host.notify_center.post(kRinger, 0);  // still waits on the queue
  monitor.clear();
  host.queue.runUntilIdle();
  EXPECT_THAT(filed("ringerstate"), HasSubstr("ringerstate=1"));
  EXPECT_TRUE(host.notify_center.watchers.empty());
}

TEST_F(SystemMonitor, ResetForgetsEverythingAndANewStartHasANewDictionary) {
  EXPECT_EQ(monitor.getSystemMonitorDictionary(), nullptr);
  EXPECT_TRUE(monitor.getSystemMonitorKeys().empty());
  initialize();
  post(kRinger, 1);
  const auto old = monitor.getSystemMonitorDictionary();
  monitor.reset();
  EXPECT_EQ(monitor.getSystemMonitorDictionary(), nullptr);
  EXPECT_TRUE(host.notify_center.watchers.empty());
  EXPECT_NE(old->stateOf("ringerstate"), std::nullopt);
  initialize();
  EXPECT_NE(monitor.getSystemMonitorDictionary(), old);
  EXPECT_EQ(filed("ringerstate"), "-");
}

TEST(SystemMonitorEnd, TakesItsRegistrationsBack) {
  test::TestPlatform host;
  {
    TalReportingSystemMonitor monitor(host.platform);
    monitor.initializeWithQueue(host.queue);
    host.notify_center.post(kRinger, 1);
  }
  host.queue.runUntilIdle();
  EXPECT_TRUE(host.notify_center.watchers.empty());
}

}  // namespace
}  // namespace tal
