#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <string>

#include "platform/HostFakes.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/notify/NotifyDirectory.h"
#include "platform/linux/notify/NotifyFiles.h"

namespace tal {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

/// Nothing is read from the kernel until the test waits.
class NotifyDirectoryTest : public testing::Test {
 protected:
  void post(const std::string& name) { ASSERT_FALSE(postNotification(folder(), name, 1)); }
  /// Everything up to a post named "end".
  NotifyDirectory::Changes waitForEnd() {
    NotifyDirectory::Changes all;
    while (all.posted.empty() || all.posted.back() != "end") {
      const auto more = directory.wait();
      all.posted.insert(all.posted.end(), more.posted.begin(), more.posted.end());
      all.some_missed |= more.some_missed;
    }
    all.posted.pop_back();
    return all;
  }
  std::filesystem::path folder() const { return temporary.path() / "notify"; }

  test::TemporaryDirectory temporary;
  test::RecordingLogSink lines;
  LogChannels log{&lines};
  NotifyDirectory directory{folder(), log.service};
};

TEST_F(NotifyDirectoryTest, KeepsEqualPostsApartWhileNobodyReads) {
  constexpr int kPosts = 50;
  for (int i = 0; i < kPosts; ++i) post("a");
  for (int i = 0; i < kPosts; ++i) std::ofstream(folder() / "a") << "1";  // in a hurry
  for (int i = 0; i < kPosts; ++i) {
    test::writeFile(temporary.path() / "elsewhere", "1");
    std::filesystem::rename(temporary.path() / "elsewhere", folder() / "a");
  }
  post("end");
  const auto changes = waitForEnd();
  EXPECT_THAT(changes.posted, SizeIs(3 * kPosts));
  EXPECT_THAT(changes.posted, Each("a"));
  EXPECT_FALSE(changes.some_missed);
}

TEST_F(NotifyDirectoryTest, FilesOfOtherKindsAndNamesHarmNothing) {
  const std::string longest(255, 'n');
  std::filesystem::create_directory(folder() / "directory");
  std::filesystem::create_symlink("/dev/null", folder() / "link");
  test::writeFile(folder() / ".hidden", "1");
  post("line\nend");
  post(longest);
  std::filesystem::remove(folder() / longest);
  post("end");
  const auto changes = waitForEnd();
  EXPECT_THAT(changes.posted, ElementsAre("line\nend", longest));
  EXPECT_THAT(lines.lines(), IsEmpty());
}

TEST_F(NotifyDirectoryTest, SaysWhenTheKernelHasLostCount) {
  int limit = 0;
  std::ifstream("/proc/sys/fs/inotify/max_queued_events") >> limit;
  if (limit == 0 || limit > 100'000) GTEST_SKIP() << "this machine keeps " << limit << " events";
  test::writeFile(folder() / "x", "1");
  for (int i = 0; i < limit / 2; ++i) {
    std::filesystem::rename(folder() / "x", folder() / "y");
    std::filesystem::rename(folder() / "y", folder() / "x");
  }
  bool some_missed = false;
  while (!some_missed) some_missed = directory.wait().some_missed;
  post("end");
  EXPECT_FALSE(waitForEnd().some_missed) << "it goes on as before";
}

TEST_F(NotifyDirectoryTest, ADirectoryThatIsOpenElsewhereIsMadeAnewAllTheSame) {
  const std::filesystem::directory_iterator keeps_it_open(folder());
  std::filesystem::remove(folder());
  EXPECT_TRUE(directory.wait().some_missed);
  EXPECT_TRUE(std::filesystem::is_directory(folder()));
  post("end");
  EXPECT_THAT(waitForEnd().posted, IsEmpty());
}

TEST_F(NotifyDirectoryTest, HearsNothingFromADirectoryThatWasMovedAway) {
  std::filesystem::rename(folder(), temporary.path() / "old");
  EXPECT_TRUE(directory.wait().some_missed);
  ASSERT_FALSE(postNotification(temporary.path() / "old", "a", 1));
  post("end");
  EXPECT_THAT(waitForEnd().posted, IsEmpty());
}

TEST_F(NotifyDirectoryTest, EndsWhileItWaitsAndFromThenOn) {
  directory.end();
  EXPECT_TRUE(directory.wait().ended);
  EXPECT_TRUE(directory.wait().ended);
}

}  // namespace
}  // namespace tal
