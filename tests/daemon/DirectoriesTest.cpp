#include <gtest/gtest.h>
#include <sys/stat.h>

#include <map>
#include <string>

#include "daemon/Directories.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/process/StartupError.h"

namespace tal {
namespace {

Environment environmentOf(std::map<std::string, std::string> variables) {
  return [variables = std::move(variables)](const char* name) -> std::optional<std::string> {
    const auto found = variables.find(name);
    return found == variables.end() ? std::nullopt : std::optional(found->second);
  };
}

TEST(Directories, AreChosenByOptionThenRootThenUser) {
  const Environment user = environmentOf({{"HOME", "/home/u"}, {"XDG_RUNTIME_DIR", "/run/user/7"}});
  const Environment user_with_all = environmentOf({{"HOME", "/home/u"},
                                                   {"XDG_RUNTIME_DIR", "/run/user/7"},
                                                   {"XDG_CONFIG_HOME", "/c"},
                                                   {"XDG_STATE_HOME", "/s"}});
  const struct {
    const char* name;
    DirectoryOptions options;
    bool as_root;
    Environment environment;
    Directories expected;
  } rows[] = {
      {"root",
       {},
       true,
       environmentOf({}),
       {"/etc/talreporting", "/var/lib/talreporting", "/run/talreporting", "/var/log/talreporting"}},
      {"root with a user's variables",
       {},
       true,
       user_with_all,
       {"/etc/talreporting", "/var/lib/talreporting", "/run/talreporting", "/var/log/talreporting"}},
      {"user",
       {},
       false,
       user,
       {"/home/u/.config/talreporting", "/home/u/.local/state/talreporting", "/run/user/7/talreporting",
        "/home/u/.local/state/talreporting/log"}},
      {"user with all variables",
       {},
       false,
       user_with_all,
       {"/c/talreporting", "/s/talreporting", "/run/user/7/talreporting", "/s/talreporting/log"}},
      {"below one directory",
       {.root = "/d/"},
       false,
       environmentOf({}),
       {"/d/config", "/d/state", "/d/run", "/d/log"}},
      {"named ones first",
       {.root = "/d", .state = "/elsewhere", .log = "/d/../logs"},
       true,
       environmentOf({}),
       {"/d/config", "/elsewhere", "/d/run", "/logs"}},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(chooseDirectories(row.options, row.as_root, row.environment), row.expected) << row.name;
  }
  EXPECT_THROW(chooseDirectories({}, false, environmentOf({{"HOME", "/home/u"}})), StartupError)
      << "a user without a runtime directory";
  EXPECT_THROW(chooseDirectories({}, false, environmentOf({})), StartupError);
}

TEST(Directories, AreMadeWithTheirModesAndLeftAsTheyAre) {
  const test::TemporaryDirectory directory;
  const auto mode = [](const std::filesystem::path& path) {
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0) << path;
    return status.st_mode & 07777U;
  };
  const auto root = directory.path() / "made" / "on the way";
  const Directories directories = chooseDirectories({.root = root}, true, environmentOf({}));
  std::filesystem::create_directories(directories.log);
  ::chmod(directories.log.c_str(), 0700);

  const mode_t mask = ::umask(0077);
  makeDirectories(directories);
  ::umask(mask);
  EXPECT_EQ(mode(directories.config), 0755U);
  EXPECT_EQ(mode(directories.runtime), 0755U);
  EXPECT_EQ(mode(directories.state), 0750U);
  EXPECT_EQ(mode(directories.log), 0700U) << "was there before";

  test::writeFile(directory.path() / "file", "");
  EXPECT_THROW(
      makeDirectories(chooseDirectories({.root = directory.path() / "file"}, true, environmentOf({}))),
      StartupError);
}

}  // namespace
}  // namespace tal
