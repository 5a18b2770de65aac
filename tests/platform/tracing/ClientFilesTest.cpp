#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/tracing/ClientRights.h"
#include "platform/linux/tracing/LinuxClientFiles.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using test::readFile;
using test::writeFile;

constexpr std::size_t kMost = 100;

/// The tests' own user is owner of everything; the client is told by what is
/// asked in its name.
class ClientFilesTest : public ::testing::Test {
 protected:
  ClientFilesTest() { fs::permissions(root, fs::perms(0755)); }

  std::string read(const fs::path& path, const ClientIdentity* client) {
    const auto contents = files.read(client, path.string(), kMost);
    return contents.bytes ? *contents.bytes : "refused: " + contents.error;
  }
  std::string openDirectory(const fs::path& path, const ClientIdentity* client) {
    const auto opened = files.openDirectory(client, path.string());
    return opened.directory ? "opened" : opened.error;
  }
  static mode_t modeOf(const fs::path& path) {
    struct stat status {};
    return ::lstat(path.c_str(), &status) == 0 ? status.st_mode & 07777U : 0;
  }

  test::TemporaryDirectory temporary;
  const fs::path root = fs::canonical(temporary.path());
  LinuxClientFiles files{root};
  // Nobody that these files belong to.
  const ClientIdentity stranger{.user = 4242, .group = 4242, .supplementary_groups = {4343}};
  const ClientIdentity self{.user = ::geteuid(), .group = ::getegid()};
};

TEST_F(ClientFilesTest, RightsAreThoseOfTheFirstClassThatFits) {
  struct Row {
    uid_t owner;
    gid_t group;
    mode_t mode;
    bool may_read;
  };
  const Row rows[] = {{4242, 1, 0400, true}, {4242, 1, 0044, false}, {1, 4242, 0040, true},
                      {1, 4343, 0040, true}, {1, 4343, 0404, false}, {1, 1, 0004, true},
                      {1, 1, 0440, false}};
  for (const Row& row : rows) {
    struct stat status {};
    status.st_uid = row.owner;
    status.st_gid = row.group;
    status.st_mode = S_IFREG | row.mode;
    EXPECT_EQ(mayDo(stranger, status, Right::kRead), row.may_read)
        << row.owner << ':' << row.group << ' ' << std::oct << row.mode;
  }
}

TEST_F(ClientFilesTest, ReadsWhatTheClientCouldReadItself) {
  const fs::path list = root / "lists/probes";
  writeFile(list, "content");
  fs::permissions(list, fs::perms(0644));
  fs::permissions(root / "lists", fs::perms(0755));
  EXPECT_EQ(read(list, &stranger), "content");
  EXPECT_EQ(read(list, nullptr), "refused: nothing is known of the client's rights");

  fs::permissions(list, fs::perms(0640));
  EXPECT_EQ(read(list, &stranger), "refused: the client may not read it");
  EXPECT_EQ(read(list, &self), "content");
  fs::permissions(list, fs::perms(0644));
  fs::permissions(root / "lists", fs::perms(0750));
  EXPECT_EQ(read(list, &stranger), "refused: the client may not look for probes");
}

TEST_F(ClientFilesTest, RefusesWhatIsNoPlainAbsolutePathToAFile) {
  writeFile(root / "target", "secret");
  writeFile(root / "large", std::string(kMost + 1, 'x'));
  writeFile(root / "largest", std::string(kMost, 'x'));
  fs::create_symlink("target", root / "link");
  fs::create_directory(root / "directory");
  fs::create_symlink("directory", root / "way");
  writeFile(root / "directory/file", "inside");
  ASSERT_EQ(::mkfifo((root / "fifo").c_str(), 0666), 0);

  EXPECT_EQ(read(root / "link", &self), "refused: link is a symbolic link");
  EXPECT_EQ(read(root / "way/file", &self), "refused: way is a symbolic link");
  EXPECT_EQ(read(root / "directory/../target", &self), "refused: the path is not absolute, or holds . or ..");
  EXPECT_EQ(read("target", &self), "refused: the path is not absolute, or holds . or ..");
  EXPECT_EQ(read("", &self), "refused: the path is not absolute, or holds . or ..");
  EXPECT_EQ(read(root / "directory", &self), "refused: it is no file");
  EXPECT_EQ(read(root / "fifo", &self), "refused: it is no file");
  EXPECT_EQ(read(root / "missing", &self), "refused: there is no missing");
  EXPECT_EQ(read(root / "target/below", &self), "refused: what holds below is no directory");
  EXPECT_EQ(read(root / "large", &self), "refused: it is over 100 bytes");
  EXPECT_EQ(read(root / "largest", &self), std::string(kMost, 'x'));
}

TEST_F(ClientFilesTest, DirectoriesAreMadeOpenToEveryoneWhereTheClientMayWrite) {
  fs::create_directory(root / "open");
  fs::permissions(root / "open", fs::perms(0777));
  const mode_t before = ::umask(0077);
  EXPECT_EQ(openDirectory(root / "open/a/b", &stranger), "opened");
  ::umask(before);
  EXPECT_EQ(modeOf(root / "open/a"), 0777U);
  EXPECT_EQ(modeOf(root / "open/a/b"), 0777U);
  EXPECT_EQ(openDirectory(root / "open/a/b", &stranger), "opened") << "once more";

  EXPECT_EQ(openDirectory(root / "mine", &stranger), "the client may not make mine");
  fs::create_directory(root / "readable");
  fs::permissions(root / "readable", fs::perms(0755));
  EXPECT_EQ(openDirectory(root / "readable", &stranger), "the client may not write to it");
  EXPECT_EQ(openDirectory("relative", &stranger), "the path is not absolute, or holds . or ..");
  fs::create_symlink("/tmp", root / "open/way");
  EXPECT_EQ(openDirectory(root / "open/way/x", &stranger), "way is a symbolic link");
  writeFile(root / "open/file", "");
  fs::permissions(root / "open/file", fs::perms(0666));
  EXPECT_EQ(openDirectory(root / "open/file", &stranger), "it is no directory");
}

TEST_F(ClientFilesTest, ResultsReplaceLeftoversAndMoveIntoPlace) {
  fs::create_directory(root / "results");
  fs::permissions(root / "results", fs::perms(0777));
  writeFile(root / "secret", "untouched");
  fs::create_symlink(root / "secret", root / "results/temp");
  writeFile(root / "results/final", "of last time");
  const auto opened = files.openDirectory(&stranger, (root / "results").string());
  ASSERT_TRUE(opened.directory) << opened.error;

  auto file = opened.directory->createFile("temp").file;
  ASSERT_TRUE(file);
  ASSERT_EQ(file->write("numbers"), std::nullopt);
  ASSERT_EQ(file->close(), std::nullopt);
  EXPECT_EQ(opened.directory->move("temp", "final"), std::nullopt);
  EXPECT_EQ(readFile(root / "results/final"), "numbers");
  EXPECT_EQ(modeOf(root / "results/final"), 0644U);
  EXPECT_EQ(readFile(root / "secret"), "untouched");
  EXPECT_FALSE(fs::exists(root / "results/temp"));
  EXPECT_TRUE(opened.directory->move("missing", "final").has_value());
}

TEST_F(ClientFilesTest, WithTheStickyBitOthersFilesStay) {
  if (::geteuid() == 4242) GTEST_SKIP() << "runs as the very user that it takes for a stranger";
  fs::create_directory(root / "sticky");
  ASSERT_EQ(::chmod((root / "sticky").c_str(), 01777), 0);
  writeFile(root / "sticky/others", "stays");
  const auto opened = files.openDirectory(&stranger, (root / "sticky").string());
  ASSERT_TRUE(opened.directory) << opened.error;
  EXPECT_EQ(opened.directory->createFile("others").error, "others is not the client's to replace");
  ASSERT_TRUE(opened.directory->createFile("temp").file);
  EXPECT_EQ(opened.directory->move("temp", "others"), "others is not the client's to replace");
  EXPECT_EQ(readFile(root / "sticky/others"), "stays");
}

}  // namespace
}  // namespace tal
