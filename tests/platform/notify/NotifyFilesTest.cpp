#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <string>
#include <thread>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/notify/NotifyFiles.h"

namespace tal {
namespace {

using testing::HasSubstr;

class NotifyFilesTest : public testing::Test {
 protected:
  std::filesystem::path folder() const { return temporary.path() / "notify"; }
  std::string post(const std::string& name, std::optional<std::uint64_t> state = std::nullopt) {
    const auto error = postNotification(folder(), name, state);
    return error ? error->reason : "posted";
  }
  std::string stateOf(const std::string& name) {
    const auto state = readNotificationState(folder(), name);
    const auto* error = std::get_if<NotifyError>(&state);
    return error ? error->reason : std::to_string(std::get<std::uint64_t>(state));
  }
  static mode_t modeOf(const std::filesystem::path& path) {
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0);
    return status.st_mode & 07777U;
  }

  test::TemporaryDirectory temporary;
};

TEST_F(NotifyFilesTest, APostIsTheStateInDecimalForAllToReadWhateverTheMask) {
  const mode_t mask = ::umask(0077);
  EXPECT_EQ(post("org.vantle.a", std::uint64_t{0} - 1), "posted");
  ::umask(mask);
  EXPECT_EQ(test::readFile(folder() / "org.vantle.a"), "18446744073709551615");
  EXPECT_EQ(modeOf(folder()), 0775U);
  EXPECT_EQ(modeOf(folder() / "org.vantle.a"), 0644U);
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder()), {}), 1) << "no litter";
}

TEST_F(NotifyFilesTest, StatesThatReadAndStatesThatDoNot) {
  std::filesystem::create_directory(folder());
  const std::string no_number = "holds no decimal number of 64 bits";
  const std::array<std::pair<const char*, std::string>, 12> rows{
      {{"0", "0"},
       {"17\n", "17"},
       {"18446744073709551615", "18446744073709551615"},
       {"18446744073709551616", no_number},
       {"", no_number},
       {"\n", no_number},
       {"-1", no_number},
       {"+1", no_number},
       {"1.5", no_number},
       {"0x10", no_number},
       {"1 2", no_number},
       {"00000000000000000000000000000000001", no_number}}};
  for (const auto& [content, expected] : rows) {
    test::writeFile(folder() / "a", content);
    EXPECT_EQ(stateOf("a"), expected) << '"' << content << '"';
  }
}

TEST_F(NotifyFilesTest, WhatIsNoFileIsNeitherReadNorFollowed) {
  std::filesystem::create_directory(folder());
  test::writeFile(temporary.path() / "secret", "1");
  std::filesystem::create_symlink(temporary.path() / "secret", folder() / "link");
  std::filesystem::create_directory(folder() / "directory");
  ASSERT_EQ(::mkfifo((folder() / "fifo").c_str(), 0600), 0);
  EXPECT_THAT(stateOf("link"), HasSubstr("symbolic links"));
  EXPECT_EQ(stateOf("directory"), "is not a file");
  EXPECT_EQ(stateOf("fifo"), "is not a file");
  EXPECT_THAT(post("fifo"), HasSubstr("its state cannot be kept"));
  EXPECT_THAT(post("directory", 1), HasSubstr("directory"));
  EXPECT_EQ(post("link", 5), "posted") << "in the link's place";
  EXPECT_EQ(test::readFile(temporary.path() / "secret"), "1");
  EXPECT_EQ(stateOf("link"), "5");
}

TEST_F(NotifyFilesTest, NamesThatLeadElsewhereAreRefused) {
  for (const std::string& name :
       {std::string(), std::string("."), std::string(".."), std::string(".post"), std::string("a/b"),
        std::string("/a"), std::string("a\0b", 3), std::string(256, 'n')}) {
    EXPECT_EQ(post(name, 1), "is no name of a notification");
    EXPECT_EQ(stateOf(name), "is no name of a notification");
  }
  EXPECT_EQ(post(std::string(255, 'n'), 1), "posted");
}

TEST_F(NotifyFilesTest, WithoutARuntimeDirectoryNothingIsPosted) {
  const auto error = postNotification(temporary.path() / "missing" / "notify", "a", 1);
  ASSERT_TRUE(error);
  EXPECT_THAT(error->reason, HasSubstr("No such file or directory"));
  EXPECT_FALSE(std::filesystem::exists(temporary.path() / "missing"));
  EXPECT_EQ(stateOf("a"), "0");
}

TEST_F(NotifyFilesTest, WhoeverSitsOnTheLockKeepsNobodyFromPosting) {
  std::filesystem::create_directory(folder());
  const int holder = ::open(folder().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  ASSERT_EQ(::flock(holder, LOCK_EX), 0);
  EXPECT_EQ(post("a", 1), "posted");
  EXPECT_EQ(stateOf("a"), "1");
  ::close(holder);
}

TEST_F(NotifyFilesTest, APostWithoutAStateNeverBringsAnOldOneBack) {
  constexpr std::uint64_t kPosts = 100;
  std::jthread keeper([this] {
    for (std::uint64_t i = 0; i < kPosts; ++i) post("a");
  });
  for (std::uint64_t state = 1; state <= kPosts; ++state) {
    ASSERT_EQ(post("a", state), "posted");
    ASSERT_EQ(stateOf("a"), std::to_string(state));
  }
}

}  // namespace
}  // namespace tal
