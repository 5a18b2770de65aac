#include <gtest/gtest.h>

#include <csignal>
#include <string>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/shell/LinuxCommandShell.h"

namespace tal {
namespace {

class CommandShellOnLinux : public testing::Test {
 protected:
  std::string outputOf(const std::string& command_line) {
    std::string output;
    ran = shell.run(command_line, [&output](std::string_view bytes) { output += bytes; });
    return output;
  }

  test::TemporaryDirectory programs;
  LinuxCommandShell shell{programs.path()};
  bool ran = false;
};

TEST_F(CommandShellOnLinux, HandsOverAllThatACommandWrites) {
  EXPECT_EQ(outputOf("echo one; printf two"), "one\ntwo");
  EXPECT_TRUE(ran);
  EXPECT_EQ(outputOf("head -c 1000000 /dev/zero").size(), 1'000'000U);
  EXPECT_EQ(outputOf("cat"), "") << "no standard input";
  EXPECT_EQ(outputOf("echo before; exit 3"), "before\n");
  EXPECT_TRUE(ran) << "what it thinks of its success is its own affair";
}

TEST_F(CommandShellOnLinux, TellsWhatCouldNotBeRun) {
  outputOf("no-such-tool-anywhere 2>/dev/null");
  EXPECT_FALSE(ran);
  test::writeFile(programs.path() / "plain-file", "text");
  outputOf("plain-file 2>/dev/null");
  EXPECT_FALSE(ran);
}

TEST_F(CommandShellOnLinux, FindsProgramsBesideTheServiceFirst) {
  const auto tool = programs.path() / "ls";
  test::writeFile(tool, "#!/bin/sh\necho mine\n");
  std::filesystem::permissions(tool, std::filesystem::perms::owner_all);
  EXPECT_EQ(outputOf("ls"), "mine\n");
  EXPECT_EQ(outputOf("cat /dev/null && echo others"), "others\n");
}

TEST_F(CommandShellOnLinux, CommandsEndOfBrokenPipesAsTheyExpect) {
  const auto before = std::signal(SIGPIPE, SIG_IGN);
  EXPECT_EQ(outputOf("kill -PIPE $$; echo survived"), "");
  std::signal(SIGPIPE, before);
}

}  // namespace
}  // namespace tal
