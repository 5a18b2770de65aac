#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <csignal>
#include <string>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/capture/CaptureArchive.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

class CaptureArchiveTest : public ::testing::Test {
 protected:
  static constexpr const char* kOld = "20260101T000000Z-haptics";
  static constexpr const char* kNew = "20260102T000000Z-alarms";

  std::error_code store(const std::string& name, const std::string& text) {
    std::error_code error;
    const auto draft = archive.begin(name, error);
    if (!draft) return error;
    draft->write("log.txt", text);
    return draft->finish();
  }
  std::vector<std::string> names() const {
    std::vector<std::string> found;
    for (const auto& entry : fs::directory_iterator(captures)) found.push_back(entry.path().filename());
    return found;
  }
  static mode_t modeOf(const fs::path& path) {
    struct stat status {};
    ::stat(path.c_str(), &status);
    return status.st_mode & 07777;
  }

  test::TemporaryDirectory directory;
  fs::path captures = directory.path() / "Audio/Captures";
  CaptureArchive archive{directory.path()};
};

TEST_F(CaptureArchiveTest, CaptureAppearsWholeForTheGroupAlone) {
  const mode_t mask = ::umask(0077);
  std::error_code error;
  auto draft = archive.begin(kNew, error);
  ASSERT_TRUE(draft) << error.message();
  draft->write("log.txt", "one");
  EXPECT_FALSE(fs::exists(captures / kNew));
  draft->write("system.txt", "two");
  EXPECT_FALSE(draft->finish());
  draft.reset();
  ::umask(mask);
  EXPECT_THAT(names(), ElementsAre(kNew));
  EXPECT_EQ(test::readFile(captures / kNew / "system.txt"), "two");
  EXPECT_EQ(modeOf(captures / kNew / "log.txt"), 0640U);
  EXPECT_EQ(modeOf(captures / kNew), 0750U);
  EXPECT_EQ(modeOf(captures), 0750U);
  EXPECT_EQ(modeOf(directory.path() / "Audio"), 0777U) << "others of the service write there as well";
  EXPECT_TRUE(store(kNew, "again")) << "a capture is never replaced";
  EXPECT_EQ(test::readFile(captures / kNew / "log.txt"), "one");
}

TEST_F(CaptureArchiveTest, WhatCannotBeWrittenWholeLeavesNothing) {
  const auto before = std::signal(SIGXFSZ, SIG_IGN);
  rlimit limit{};
  ::getrlimit(RLIMIT_FSIZE, &limit);
  const rlimit small{.rlim_cur = 1000, .rlim_max = limit.rlim_max};
  ::setrlimit(RLIMIT_FSIZE, &small);
  std::error_code error;
  {
    const auto draft = archive.begin(kNew, error);
    ASSERT_TRUE(draft);
    draft->write("a.txt", "fits");
    draft->write("b.txt", std::string(2000, 'x'));
    draft->write("c.txt", "fits");
    error = draft->finish();
  }
  ::setrlimit(RLIMIT_FSIZE, &limit);
  std::signal(SIGXFSZ, before);
  EXPECT_EQ(error, std::errc::file_too_large);
  EXPECT_THAT(names(), IsEmpty());
}

TEST_F(CaptureArchiveTest, DraftsOfADeadProcessAreRemovedAndNothingElse) {
  store(kOld, "whole");
  test::writeFile(captures / ".draft-20260103T000000Z-x/log.txt", "half");
  test::writeFile(captures / "notes/mine.txt", "keep");
  const fs::path outside = directory.path() / "outside";
  test::writeFile(outside / "precious.txt", "keep");
  fs::create_directory_symlink(outside, captures / ".draft-link");
  archive.removeDrafts();
  EXPECT_THAT(names(), UnorderedElementsAre(kOld, "notes", ".draft-link"));
  EXPECT_EQ(test::readFile(outside / "precious.txt"), "keep");
}

TEST_F(CaptureArchiveTest, OldestGoFirstUntilTheRestFits) {
  store(kNew, std::string(600, 'n'));
  store(kOld, std::string(600, 'o'));
  const fs::path outside = directory.path() / "outside";
  test::writeFile(outside / "precious.txt", std::string(5000, 'p'));
  fs::create_directory_symlink(outside, captures / "20250101T000000Z-link");
  fs::create_symlink(outside / "precious.txt", captures / kOld / "link.txt");
  test::writeFile(captures / "notes/mine.txt", std::string(5000, 'm'));
  EXPECT_THAT(archive.keepWithin(5000), IsEmpty()) << "neither links nor others' files count";
  EXPECT_THAT(archive.keepWithin(1199), ElementsAre(kOld));
  EXPECT_THAT(names(), UnorderedElementsAre(kNew, "notes", "20250101T000000Z-link"));
  EXPECT_EQ(test::readFile(outside / "precious.txt").size(), 5000U);
}

TEST_F(CaptureArchiveTest, NothingIsWrittenThroughALink) {
  const fs::path outside = directory.path() / "outside";
  fs::create_directories(outside);
  fs::create_directories(directory.path() / "Audio");
  fs::create_directory_symlink(outside, captures);
  EXPECT_TRUE(store(kNew, "text"));
  EXPECT_TRUE(fs::is_empty(outside));
}

}  // namespace
}  // namespace tal
