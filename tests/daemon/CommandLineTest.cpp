#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vector>

#include "daemon/CommandLine.h"

namespace tal {
namespace {

std::variant<DaemonOptions, ExitStatus> parsed(std::vector<const char*> arguments) {
  arguments.insert(arguments.begin(), "talreportingd");
  return parseCommandLine(static_cast<int>(arguments.size()), arguments.data(), "1.2.3");
}

TEST(CommandLine, ReadsItsOptions) {
  const auto options = std::get<DaemonOptions>(
      parsed({"--root", "/r", "--config-dir=/c", "--state-dir", "/s", "--runtime-dir", "/run", "--log-dir",
              "/l", "--host-root", "/h", "--log-level", "debug", "--log-to", "journal"}));
  EXPECT_EQ(options.directories.root, "/r");
  EXPECT_EQ(options.directories.config, "/c");
  EXPECT_EQ(options.directories.state, "/s");
  EXPECT_EQ(options.directories.runtime, "/run");
  EXPECT_EQ(options.directories.log, "/l");
  EXPECT_EQ(options.host_root, "/h");
  EXPECT_EQ(options.log_level, LogLevel::kDebug);
  EXPECT_EQ(options.log_to, DaemonOptions::LogTo::kJournal);

  const auto none = std::get<DaemonOptions>(parsed({}));
  EXPECT_EQ(none.directories.root, std::nullopt);
  EXPECT_EQ(none.host_root, "/");
  EXPECT_EQ(none.log_level, LogLevel::kDefault);
  EXPECT_EQ(none.log_to, DaemonOptions::LogTo::kStderr);
}

TEST(CommandLine, AnswersOrComplainsAndStartsNothing) {
  testing::internal::CaptureStdout();
  EXPECT_EQ(std::get<ExitStatus>(parsed({"--version"})).value, 0);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "talreportingd 1.2.3\n");

  testing::internal::CaptureStdout();
  EXPECT_EQ(std::get<ExitStatus>(parsed({"--help"})).value, 0);
  const std::string help = testing::internal::GetCapturedStdout();
  for (const char* option : {"--root", "--config-dir", "--state-dir", "--runtime-dir", "--log-dir",
                             "--host-root", "--log-level", "--log-to", "--version", "--help"}) {
    EXPECT_THAT(help, testing::HasSubstr(option));
  }

  for (const std::vector<const char*>& wrong : {std::vector<const char*>{"--unknown"},
                                                {"--log-level", "loud"},
                                                {"--log-to", "paper"},
                                                {"--root"},
                                                {"argument"}}) {
    testing::internal::CaptureStderr();
    const auto result = parsed(wrong);
    EXPECT_NE(testing::internal::GetCapturedStderr(), "");
    ASSERT_TRUE(std::holds_alternative<ExitStatus>(result)) << wrong.front();
    EXPECT_EQ(std::get<ExitStatus>(result).value, kExitWrongUsage) << wrong.front();
  }
}

}  // namespace
}  // namespace tal
