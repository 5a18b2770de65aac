#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "system/SystemMonitorDictionary.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Observation = SystemMonitorDictionary::Observation;

class SystemMonitorDictionaryTest : public testing::Test {
 protected:
  auto note(const std::string& who) {
    return [this, who](const MessageDict& state) { journal.push_back(who + ' ' + state.text()); };
  }
  SystemMonitorDictionary dictionary;
  std::vector<std::string> journal;
};

TEST_F(SystemMonitorDictionaryTest, TellsTheObserversOfAFeatureInTheirOrderBeforeFilingReturns) {
  dictionary.file("a", {{"v", 1}});
  const Observation first = dictionary.observe("a", note("first"));
  const Observation second = dictionary.observe("a", note("second"));
  const Observation other = dictionary.observe("b", note("other"));
  EXPECT_THAT(journal, IsEmpty());
  dictionary.file("a", {{"v", 2}});
  EXPECT_THAT(journal, ElementsAre("first {v=2}", "second {v=2}"));
  EXPECT_EQ(dictionary.stateOf("a"), (MessageDict{{"v", 2}}));
  EXPECT_EQ(dictionary.stateOf("b"), std::nullopt);
  EXPECT_EQ(dictionary.stateOf("unheard of"), std::nullopt);
}

TEST_F(SystemMonitorDictionaryTest, ObservationsMayEndAndBeginWhileObserversAreTold) {
  std::optional<Observation> self;
  std::optional<Observation> earlier;
  std::optional<Observation> later;
  std::optional<Observation> begun;
  earlier.emplace(dictionary.observe("a", note("earlier")));
  self.emplace(dictionary.observe("a", [&](const MessageDict&) {
    journal.emplace_back("self");
    earlier.reset();
    later.reset();
    begun.emplace(dictionary.observe("a", note("begun")));
    self.reset();
  }));
  later.emplace(dictionary.observe("a", note("later")));
  const Observation last = dictionary.observe("a", note("last"));
  dictionary.file("a", {{"v", 1}});
  EXPECT_THAT(journal, ElementsAre("earlier {v=1}", "self", "last {v=1}"));
  journal.clear();
  dictionary.file("a", {{"v", 2}});
  EXPECT_THAT(journal, ElementsAre("last {v=2}", "begun {v=2}"));
}

TEST_F(SystemMonitorDictionaryTest, WhoFilesFromAnObserverLeavesNobodyWithTheOldState) {
  const Observation filer = dictionary.observe("a", [&](const MessageDict& state) {
    if (state == MessageDict{{"v", 1}}) dictionary.file("a", {{"v", 2}});
  });
  const Observation last = dictionary.observe("a", note("last"));
  dictionary.file("a", {{"v", 1}});
  EXPECT_EQ(journal.back(), "last {v=2}");
}

}  // namespace
}  // namespace tal
