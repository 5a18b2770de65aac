#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <future>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "platform/linux/kite/KiteReport.h"
#include "platform/linux/kite/LinuxTapToKiteService.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;

/// Drafts into a diagnostic log in memory; the desktop answers as it is told to.
class TapToKiteService : public testing::Test {
 protected:
  /// What the completion was told, once everything is done.
  std::optional<std::string> create(std::optional<std::string> process_name = "parleyd") {
    std::promise<std::optional<std::string>> told;
    {
      LinuxTapToKiteService service({.diagnostic_log = files,
                                     .clock = host.clock,
                                     .log = host.channels.session,
                                     .program = "talreportingd 9",
                                     .show = [this](const DesktopNotification& notification) {
                                       shown.push_back(notification.title + '\n' + notification.body);
                                       return desktop_error;
                                     }});
      service.createDraft({.title = "Title",
                           .problem_description = "What went wrong.",
                           .component = {.name = "Core", .version = "All", .identifier = 5},
                           .reproducibility = 6,
                           .classification = 7,
                           .diagnostic_extension_identifiers = {"org.vantle.a", "org.vantle.b"}},
                          std::move(process_name), "something occurred",
                          [&told](const std::optional<std::string>& error) { told.set_value(error); });
    }
    return told.get_future().get();
  }
  std::string fileEndingWith(const std::string& ending) const {
    for (const auto& [path, content] : files.files) {
      if (path.ends_with(ending)) return content;
    }
    return "";
  }

  test::TestPlatform host;
  test::FakeDiagnosticLog& files = host.diagnostic_log;
  std::vector<std::string> shown;
  std::optional<std::string> desktop_error;
};

TEST_F(TapToKiteService, WritesADraftForProgramsAndItsTwinForPeople) {
  EXPECT_EQ(create(), std::nullopt);
  EXPECT_THAT(files.directories, ElementsAre("Audio/Drafts"));
  ASSERT_EQ(files.files.size(), 2U);
  EXPECT_THAT(files.files.begin()->first,
              MatchesRegex("/log/Audio/Drafts/20240131-154502.0100-[0-9a-f]{8}\\.json"));
  const auto json = nlohmann::json::parse(fileEndingWith(".json"));
  EXPECT_EQ(json["title"], "Title");
  EXPECT_EQ(json["component"], (nlohmann::json{{"name", "Core"}, {"version", "All"}, {"identifier", 5}}));
  EXPECT_EQ(json["reproducibility"], 6);
  EXPECT_EQ(json["classification"], 7);
  EXPECT_EQ(json["diagnostic_extension_identifiers"], (nlohmann::json{"org.vantle.a", "org.vantle.b"}));
  EXPECT_EQ(json["process_name"], "parleyd");
  EXPECT_EQ(json["created_at"], "2027-01-15T08:00:00.000000Z");
  const std::string markdown = fileEndingWith(".md");
  EXPECT_THAT(markdown, testing::StartsWith("# Title\n\nWhat went wrong.\n\n| | |\n|---|---|\n"));
  EXPECT_THAT(markdown, HasSubstr("| Component | Core, version All (5) |\n"));
  EXPECT_THAT(markdown, HasSubstr("| Program | `parleyd` |\n"));
  EXPECT_THAT(markdown, HasSubstr("| Reason | something occurred |\n"));
  EXPECT_THAT(shown,
              ElementsAre(HasSubstr("Title\nYou are asked for a bug report because something occurred. "
                                    "A draft to paste: /log/Audio/Drafts/")));
}

TEST_F(TapToKiteService, NamesOfProgramsStayInTheirPlace) {
  EXPECT_EQ(create("`|\n# boo\x7F"), std::nullopt);
  EXPECT_THAT(fileEndingWith(".md"), HasSubstr("| Program | `___# boo_` |\n"));
  files.files.clear();
  EXPECT_EQ(create(std::nullopt), std::nullopt);
  EXPECT_THAT(fileEndingWith(".md"), HasSubstr("| Program | unknown |\n"));
  EXPECT_FALSE(nlohmann::json::parse(fileEndingWith(".json")).contains("process_name"));
}

TEST_F(TapToKiteService, ADiskThatFailsIsToldAndTheDesktopIsNot) {
  files.directory_error = "read-only";
  EXPECT_EQ(create(), "read-only");
  files.directory_error.reset();
  files.open_error = "no space";
  EXPECT_THAT(create().value_or(""), MatchesRegex("20240131-.*\\.md: no space"));
  files.open_error.reset();
  files.close_error = "disk full";
  EXPECT_THAT(create().value_or(""), HasSubstr(".md: disk full"));
  EXPECT_THAT(shown, ElementsAre());
}

TEST_F(TapToKiteService, ANewDraftTakesThePlaceOfTheOldest) {
  for (std::size_t i = 0; i < kMostDrafts; ++i) {
    const std::string name = "/log/Audio/Drafts/20230131-" + std::to_string(100000 + i);
    files.files[name + ".json"] = files.files[name + ".md"] = "older";
  }
  EXPECT_EQ(create(), std::nullopt);
  EXPECT_EQ(files.files.size(), 2 * kMostDrafts);
  EXPECT_EQ(files.files.begin()->first, "/log/Audio/Drafts/20230131-100001.json");
  EXPECT_NE(files.files.rbegin()->second, "older");
}

TEST_F(TapToKiteService, ADraftIsMadeWhereThereIsNoDesktop) {
  desktop_error = "no session bus";
  EXPECT_EQ(create(), std::nullopt);
  EXPECT_EQ(files.files.size(), 2U);
  EXPECT_TRUE(host.log.holds("a bug report waits to be filed: /log/Audio/Drafts/20240131-"));
  EXPECT_EQ(host.log.count("the desktop was not told of the draft: no session bus"), 1U);
}

}  // namespace
}  // namespace tal
