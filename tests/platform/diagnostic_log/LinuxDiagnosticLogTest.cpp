#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <csignal>
#include <filesystem>
#include <set>
#include <string>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;

/// A limit on the size of files stands in for a full disk.
class SmallFiles {
 public:
  SmallFiles() : handler_(std::signal(SIGXFSZ, SIG_IGN)) {
    getrlimit(RLIMIT_FSIZE, &before_);
    const rlimit tiny{.rlim_cur = 8, .rlim_max = before_.rlim_max};
    setrlimit(RLIMIT_FSIZE, &tiny);
  }
  SmallFiles(const SmallFiles&) = delete;
  SmallFiles& operator=(const SmallFiles&) = delete;
  ~SmallFiles() {
    setrlimit(RLIMIT_FSIZE, &before_);
    std::signal(SIGXFSZ, handler_);
  }

 private:
  rlimit before_{};
  void (*handler_)(int);
};

class DiagnosticLogOnDisk : public ::testing::Test {
 protected:
  std::set<std::string> names(const char* place) const {
    std::set<std::string> found;
    for (const auto& entry : fs::directory_iterator(root.path() / place))
      found.insert(entry.path().filename().string());
    return found;
  }

  test::TemporaryDirectory root;
  LinuxDiagnosticLog log{root.path()};
};

TEST_F(DiagnosticLogOnDisk, PlacesAreOpenToEveryoneWhateverTheMask) {
  const mode_t before = ::umask(0077);
  EXPECT_EQ(log.makeDirectory("Audio/Reporting"), std::nullopt);
  EXPECT_EQ(log.makeDirectory("Audio/Reporting"), std::nullopt) << "is there already";
  ::umask(before);
  for (const char* place : {"Audio", "Audio/Reporting"}) {
    EXPECT_EQ(fs::status(root.path() / place).permissions(), fs::perms::all) << place;
  }
  test::writeFile(root.path() / "file", "");
  EXPECT_NE(log.makeDirectory("file/below"), std::nullopt);
}

TEST_F(DiagnosticLogOnDisk, FilesAreWrittenWhole) {
  ASSERT_EQ(log.makeDirectory("Audio"), std::nullopt);
  auto opened = log.createFile("Audio", "report.json");
  ASSERT_TRUE(opened.file) << opened.error;
  std::string expected;
  for (const std::size_t size : {1U, 300'000U, 200'000U, 100'000U, 7U}) {
    const std::string piece(size, static_cast<char>('a' + size % 26));
    EXPECT_EQ(opened.file->write(piece), std::nullopt);
    expected += piece;
  }
  EXPECT_EQ(opened.file->close(), std::nullopt);
  EXPECT_EQ(test::readFile(root.path() / "Audio/report.json"), expected);
  EXPECT_EQ(log.pathOf("Audio"), (root.path() / "Audio").string());
}

TEST_F(DiagnosticLogOnDisk, NothingThatExistsIsOpenedAndNoLinkFollowed) {
  ASSERT_EQ(log.makeDirectory("Audio"), std::nullopt);
  const fs::path precious = root.path() / "precious";
  test::writeFile(precious, "keep");
  test::writeFile(root.path() / "Audio/taken", "keep");
  fs::create_symlink(precious, root.path() / "Audio/link");
  fs::create_symlink(root.path() / "elsewhere", root.path() / "Audio/dangling");
  fs::create_directory_symlink(root.path(), root.path() / "Audio/away");
  for (const char* name : {"taken", "link", "dangling"}) {
    EXPECT_FALSE(log.createFile("Audio", name).file) << name;
  }
  EXPECT_FALSE(log.createFile("Audio/away", "new").file);
  EXPECT_NE(log.makeDirectory("Audio/away/below"), std::nullopt);
  EXPECT_FALSE(fs::exists(root.path() / "elsewhere") || fs::exists(root.path() / "new"));
  EXPECT_EQ(test::readFile(precious), "keep");
}

TEST_F(DiagnosticLogOnDisk, MissingLogIsAnErrorAndNoMore) {
  LinuxDiagnosticLog missing(root.path() / "gone");
  EXPECT_NE(missing.makeDirectory("Audio"), std::nullopt);
  EXPECT_FALSE(missing.createFile("Audio", "report.json").error.empty());
}

TEST_F(DiagnosticLogOnDisk, DiskThatIsFullIsToldOfOnce) {
  ASSERT_EQ(log.makeDirectory("Audio"), std::nullopt);
  std::vector<DiagnosticFile::Error> errors;  // of each write, then of the closing
  const auto writeToFullDisk = [&](const std::string& name, const std::vector<std::size_t>& sizes) {
    errors.clear();
    auto opened = log.createFile("Audio", name);
    ASSERT_TRUE(opened.file);
    const SmallFiles only;
    for (const std::size_t size : sizes) errors.push_back(opened.file->write(std::string(size, 'x')));
    errors.push_back(opened.file->close());
  };
  const DiagnosticFile::Error none;
  writeToFullDisk("small", {30});  // waits in memory
  EXPECT_THAT(errors, ElementsAre(none, "File too large"));
  writeToFullDisk("large", {200'000, 200'000, 7, 300'000, 7});
  EXPECT_THAT(errors, ElementsAre(none, "File too large", none, none, none, none));
}

TEST_F(DiagnosticLogOnDisk, AFileAppearsWholeOrNotAtAll) {
  ASSERT_EQ(log.makeDirectory("Audio"), std::nullopt);
  const std::string text(300'000, 'x');
  EXPECT_EQ(log.putFile("Audio", "report.md", text), std::nullopt);
  EXPECT_EQ(test::readFile(root.path() / "Audio/report.md"), text);
  {
    const SmallFiles only;
    EXPECT_EQ(log.putFile("Audio", "later.md", "does not fit"), "File too large");
  }
  EXPECT_NE(log.putFile("elsewhere", "report.md", text), std::nullopt);
  EXPECT_THAT(names("Audio"), ElementsAre("report.md"));
}

TEST_F(DiagnosticLogOnDisk, OnlyTheLastFilesAreKept) {
  ASSERT_EQ(log.makeDirectory("Audio/20230101"), std::nullopt);
  fs::create_symlink(root.path() / "precious", root.path() / "Audio/20230102");
  for (const char* name : {"20240103", "20240101", ".unfinished-20240104", "20240102"}) {
    test::writeFile(root.path() / "Audio" / name, "");
  }
  log.keepLast("Audio", 4);
  EXPECT_EQ(names("Audio").size(), 6U);
  log.keepLast("Audio", 2);
  EXPECT_THAT(names("Audio"), ElementsAre("20230101", "20230102", "20240102", "20240103"));
}

}  // namespace
}  // namespace tal
