#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>  // NOLINT(modernize-deprecated-headers): mkdtemp() is POSIX

#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "reporters/pipewire/RemoteSocket.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using Variables = std::map<std::string, std::string>;

auto lookUpIn(const Variables& variables) {
  return [&variables](const char* name) -> const char* {
    const auto found = variables.find(name);
    return found == variables.end() ? nullptr : found->second.c_str();
  };
}

TEST(RemoteSocket, StandsWhereClientsLook) {
  const Variables none;
  const Variables user{{"XDG_RUNTIME_DIR", "/run/user/7"}};
  const Variables both{
      {"XDG_RUNTIME_DIR", "/run/user/7"}, {"PIPEWIRE_RUNTIME_DIR", "/tmp/pw"}, {"PIPEWIRE_REMOTE", ""}};
  const Variables named{{"PIPEWIRE_REMOTE", "studio"}};
  EXPECT_EQ(remoteNameFrom(lookUpIn(none)), "pipewire-0");
  EXPECT_EQ(remoteNameFrom(lookUpIn(both)), "pipewire-0");
  EXPECT_EQ(remoteNameFrom(lookUpIn(named)), "studio");
  EXPECT_THAT(remoteSocketPaths("a", lookUpIn(none)), ElementsAre("/run/pipewire/a"));
  EXPECT_THAT(remoteSocketPaths("a", lookUpIn(user)), ElementsAre("/run/user/7/a", "/run/pipewire/a"));
  EXPECT_THAT(remoteSocketPaths("a", lookUpIn(both)), ElementsAre("/tmp/pw/a", "/run/pipewire/a"));
  EXPECT_THAT(remoteSocketPaths("/srv/audio", lookUpIn(user)), ElementsAre("/srv/audio"));
}

TEST(ReconnectPacing, GrowsAndEndsUntilSomethingHappens) {
  ReconnectPacing pacing;
  for (int round = 0; round < 2; ++round) {
    std::chrono::milliseconds expected = ReconnectPacing::kFirstPause;
    for (int i = 0; i < ReconnectPacing::kAttempts; ++i, expected *= 2) {
      ASSERT_EQ(pacing.pauseAfterFailure(), expected);
    }
    EXPECT_EQ(expected / 2, ReconnectPacing::kLongestPause);
    EXPECT_EQ(pacing.pauseAfterFailure(), std::nullopt);
    EXPECT_EQ(pacing.pauseAfterFailure(), std::nullopt);
    pacing.startOver();
  }
}

class PathWatchTest : public testing::Test {
 protected:
  PathWatchTest() {
    std::string pattern = (fs::temp_directory_path() / "tal-watch-XXXXXX").string();
    root = mkdtemp(pattern.data());
  }
  ~PathWatchTest() override { fs::remove_all(root); }

  static void makeFile(const fs::path& path) { std::ofstream{path}; }

  fs::path root;
};

TEST_F(PathWatchTest, TellsOfThePathAndOfNothingElse) {
  PathWatch watch({root / "pipewire-0"});
  EXPECT_FALSE(watch.takeEvents());
  makeFile(root / "pulse");
  EXPECT_FALSE(watch.takeEvents());
  makeFile(root / "pipewire-0");
  EXPECT_TRUE(watch.takeEvents());
  EXPECT_FALSE(watch.takeEvents());
  fs::remove(root / "pipewire-0");
  EXPECT_FALSE(watch.takeEvents());
  makeFile(root / "draft");
  fs::rename(root / "draft", root / "pipewire-0");
  EXPECT_TRUE(watch.takeEvents()) << "moved into place";
}

TEST_F(PathWatchTest, FollowsDirectoriesThatAppearAndDisappear) {
  const fs::path directory = root / "user" / "7";
  PathWatch watch({directory / "pipewire-0", root / "system" / "pipewire-0"});
  fs::create_directory(root / "user");
  EXPECT_TRUE(watch.takeEvents());
  fs::create_directory(directory);
  EXPECT_TRUE(watch.takeEvents());
  makeFile(directory / "pipewire-0");
  EXPECT_TRUE(watch.takeEvents());
  fs::remove_all(root / "user");
  watch.takeEvents();
  fs::create_directories(directory);
  EXPECT_TRUE(watch.takeEvents());
  makeFile(directory / "pipewire-0");
  EXPECT_TRUE(watch.takeEvents());
  fs::create_directory(root / "system");
  EXPECT_TRUE(watch.takeEvents());
}

}  // namespace
}  // namespace tal
